#include "targets/judge/scenario.h"

#include <cstdint>
#include <stdexcept>

#include "base/crc32.h"
#include "targets/judge/files.h"

namespace targets {
namespace {

/// Bytes that look like nothing and are the same every time.
std::string Noise(std::size_t size, std::uint32_t seed) {
  std::string bytes(size, '\0');
  for (char& byte : bytes) {
    seed = seed * 1664525U + 1013904223U;
    byte = static_cast<char>(seed >> 24U);
  }
  return bytes;
}

std::string CrcText(const std::string& content) {
  base::Crc32 crc;
  crc.Update(content.data(), content.size());
  return std::to_string(crc.value());
}

/// Files of many kinds by HTTP, a list among them, on a device that has some of them already.
Scenario HttpJob() {
  Scenario scenario{"http_job", {}, {}};
  auto& site = scenario.site;
  site["demo/empty.txt"] = "";
  site["demo/one.txt"] = "1";
  site["demo/large.bin"] = Noise(150'000, 1);
  site["demo/deep/er/file.bin"] = Noise(9'000, 2);
  site["demo/right.txt"] = "right already";
  site["demo/wrong.txt"] = "right at last";
  site["demo/listed one.bin"] = Noise(5'000, 3);
  site["demo/foreign.bin"] = Noise(100, 4);
  site["demo/os.nb0"] = Noise(40'000, 8);
  std::string list;
  const auto add = [&site, &list](const std::string& name, const std::string& path,
                                  const std::string& masks) {
    const std::string& content = site[name];
    list += name + ',' + path + ',' + masks + ',' + CrcText(content) + ',' +
            std::to_string(content.size()) + "\r\n";
  };
  add("demo/listed one.bin", "\\Data\\listed one.bin", "*");
  add("demo/foreign.bin", "\\Data\\foreign.bin", "XX* YY*");
  site["demo/list.txt"] = list;
  return scenario;
}

/// A group gets three files: one arrives, one arrives as it should not be, one is for others.
Scenario MulticastJob() {
  Scenario scenario{"multicast_job", {}, {}};
  const std::string whole = Noise(20'000, 5);
  const std::string wanted = Noise(6'000, 6);
  std::string spoilt = wanted;
  spoilt[1234] ^= 1;
  scenario.site = {
      {"demo/whole.bin", whole}, {"demo/spoilt.bin", wanted}, {"demo/late.bin", "late"}};
  scenario.sent = {{"\\Data\\whole.bin", "TQ5* MR4*", whole},
                   {"\\Data\\other.bin", "XX*", Noise(3'000, 7)},
                   {"\\Data\\spoilt.bin", "", spoilt}};
  return scenario;
}

}  // namespace

const std::vector<Scenario>& Scenarios() {
  static const std::vector<Scenario> all = {
      MulticastJob(),
      HttpJob(),
      {"refused_jobs", {}, {}},
      {"entry_points", {}, {}},
  };
  return all;
}

std::string WalkOf(const Scenario& scenario, const std::filesystem::path& walks) {
  const std::string text = ReadFile(walks / (scenario.name + ".walk"));
  std::string walk;
  std::size_t at = 0;
  while (at < text.size()) {
    const std::size_t begin = text.find('{', at);
    walk += text.substr(at, begin - at);
    if (begin == std::string::npos) break;
    const std::size_t blank = text.find(' ', begin);
    const std::size_t end = text.find('}', begin);
    if (blank > end || end == std::string::npos) throw std::runtime_error("a { without sense");
    const std::string what = text.substr(begin + 1, blank - begin - 1);
    const auto file = scenario.site.find(text.substr(blank + 1, end - blank - 1));
    if (file == scenario.site.end()) throw std::runtime_error(text.substr(begin, end - begin + 1));
    walk += what == "crc" ? CrcText(file->second) : std::to_string(file->second.size());
    at = end + 1;
  }
  return walk;
}

}  // namespace targets
