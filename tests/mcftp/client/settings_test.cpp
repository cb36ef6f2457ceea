#include "mcftp/settings.h"

#include <gmock/gmock.h>

#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "faults/faults.h"
#include "support/device_test.h"
#include "trace/trace.h"
// The platform's own names come last.
#include <coredll.h>

#include "mcftp/registry.h"

namespace {

using mcftp::LoadSettings;
using mcftp::Registry;
using mcftp::Settings;
using Outcome = mcftp::Registry::Outcome;

constexpr char kKey[] = "HKEY_LOCAL_MACHINE\\Software\\Corvanta\\Device Management\\MCFTP Client";

const std::vector<std::pair<std::string, std::uint32_t>> kNumbers = {
    {"LoadClient", 1},
    {"AuthenticationEnabled", 0},
    {"AuthenticationAlgorithm", 0},
    {"CompressionEnabled", 0},
    {"CompressionAlgorithm", 0},
    {"EncryptionEnabled", 0},
    {"EncryptionAlgorithm", 0},
    {"MaxSessionRetries", 8},
    {"ReceiveTimeout", 32000},
    {"DallyTimeout", 5000},
    {"OverrunErrorMessages", 1},
    {"RxBlocksBeforeOverrun", 100},
    {"OverrunPercentThreshold", 85},
    {"MaxRandomBackoff", 0},
    {"RestoreFactoryDefaults", 0},
    {"Version", 0},
};

class SettingsTest : public DeviceTest {
 protected:
  static void Put(const std::string& name, std::uint32_t value) {
    Registry registry;
    ASSERT_TRUE(registry.Create(kKey));
    ASSERT_TRUE(registry.WriteDword(name, value));
  }
  static void PutText(const std::string& name, const std::string& text) {
    Registry registry;
    ASSERT_TRUE(registry.Create(kKey));
    ASSERT_TRUE(registry.WriteString(name, text));
  }
  static void Remove(const WCHAR* name) {
    HKEY key = nullptr;
    ASSERT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE,
                            TEXT("Software\\Corvanta\\Device Management\\MCFTP Client"), 0,
                            KEY_ALL_ACCESS, &key),
              ERROR_SUCCESS);
    EXPECT_EQ(RegDeleteValueW(key, name), ERROR_SUCCESS);
    RegCloseKey(key);
  }
  /// 999,999 for a value that is not there.
  static std::uint32_t Get(const std::string& name) {
    Registry registry;
    std::uint32_t value = 999999;
    if (registry.Open(kKey) == Outcome::kDone) {
      static_cast<void>(registry.ReadDword(name, value));
    }
    return value;
  }
  static std::vector<std::string> Names() {
    std::vector<std::string> names;
    HKEY key = nullptr;
    EXPECT_EQ(RegOpenKeyExW(HKEY_LOCAL_MACHINE,
                            TEXT("Software\\Corvanta\\Device Management\\MCFTP Client"), 0,
                            KEY_READ, &key),
              ERROR_SUCCESS);
    for (DWORD i = 0;; ++i) {
      WCHAR name[64];
      DWORD size = 64;
      if (RegEnumValueW(key, i, name, &size, nullptr, nullptr, nullptr, nullptr) != 0) break;
      names.emplace_back(name, name + size);
    }
    RegCloseKey(key);
    return names;
  }
};

TEST_F(SettingsTest, CreatesTheKeyWithAllSeventeenValuesOnFirstUse) {
  Settings settings;
  settings.dally_timeout_ms = 1;

  EXPECT_TRUE(LoadSettings(settings));

  EXPECT_EQ(settings.receive_timeout_ms, 32000U);
  EXPECT_EQ(settings.dally_timeout_ms, 5000U);
  EXPECT_EQ(Names().size(), 17U);
  for (const auto& [name, value] : kNumbers) EXPECT_EQ(Get(name), value) << name;
  HKEY key = nullptr;
  RegOpenKeyExW(HKEY_LOCAL_MACHINE, TEXT("Software\\Corvanta\\Device Management\\MCFTP Client"), 0,
                KEY_READ, &key);
  WCHAR text[64] = {};
  DWORD type = 0;
  DWORD size = sizeof text;
  EXPECT_EQ(RegQueryValueExW(key, TEXT("Description"), nullptr, &type,
                             reinterpret_cast<BYTE*>(text), &size),
            ERROR_SUCCESS);
  RegCloseKey(key);
  EXPECT_EQ(type, REG_SZ);
  EXPECT_EQ(std::u16string(text), u"Multicast File Transfer Client");
  EXPECT_EQ(size, (30 + 1) * sizeof(WCHAR)) << "with its terminating zero";
}

TEST_F(SettingsTest, WritesTheDefaultsInTheirOrder) {
  std::string written;
  device().trace().SetSink([&](std::string_view line) {
    constexpr std::string_view kName = "\"name\":\"";
    if (line.find("RegSetValueExW") == std::string_view::npos) return;
    const std::size_t at = line.find(kName) + kName.size();
    written += line.substr(at, line.find('"', at) - at);
    written += ' ';
  });
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  device().trace().SetSink({});

  EXPECT_EQ(written,
            "LoadClient AuthenticationEnabled AuthenticationAlgorithm CompressionEnabled "
            "CompressionAlgorithm EncryptionEnabled EncryptionAlgorithm MaxSessionRetries "
            "ReceiveTimeout DallyTimeout OverrunErrorMessages RxBlocksBeforeOverrun "
            "OverrunPercentThreshold MaxRandomBackoff RestoreFactoryDefaults Description Version ");
}

TEST_F(SettingsTest, ReadsWhatWasSet) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  std::uint32_t number = 100;
  for (const auto& [name, value] : kNumbers) {
    if (name != "RestoreFactoryDefaults") Put(name, ++number);
  }

  EXPECT_TRUE(LoadSettings(settings));

  EXPECT_EQ(settings.load_client, 101U);
  EXPECT_EQ(settings.authentication_enabled, 102U);
  EXPECT_EQ(settings.authentication_algorithm, 103U);
  EXPECT_EQ(settings.compression_enabled, 104U);
  EXPECT_EQ(settings.compression_algorithm, 105U);
  EXPECT_EQ(settings.encryption_enabled, 106U);
  EXPECT_EQ(settings.encryption_algorithm, 107U);
  EXPECT_EQ(settings.max_session_retries, 108U);
  EXPECT_EQ(settings.receive_timeout_ms, 109U);
  EXPECT_EQ(settings.dally_timeout_ms, 110U);
  EXPECT_EQ(settings.overrun_error_messages, 111U);
  EXPECT_EQ(settings.rx_blocks_before_overrun, 112U);
  EXPECT_EQ(settings.overrun_percent_threshold, 113U);
  EXPECT_EQ(settings.max_random_backoff, 114U);
}

TEST_F(SettingsTest, RestoresTheDefaultsWhenAskedTo) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  Put("RestoreFactoryDefaults", 1);
  Put("DallyTimeout", 9000);
  Put("Stranger", 5);

  EXPECT_TRUE(LoadSettings(settings));

  EXPECT_EQ(settings.dally_timeout_ms, 5000U);
  EXPECT_EQ(Get("DallyTimeout"), 5000U);
  EXPECT_EQ(Get("RestoreFactoryDefaults"), 0U);
  EXPECT_EQ(Get("Stranger"), 999999U) << "the key was deleted before";
}

TEST_F(SettingsTest, WritesTheWishToRestoreThatIsMissingAndReadsOn) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  Put("DallyTimeout", 9000);
  Remove(TEXT("RestoreFactoryDefaults"));

  EXPECT_TRUE(LoadSettings(settings));

  EXPECT_EQ(settings.dally_timeout_ms, 9000U);
  EXPECT_EQ(Get("RestoreFactoryDefaults"), 0U);
}

TEST_F(SettingsTest, StopsAtTheFirstValueThatIsMissing) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  Put("MaxSessionRetries", 3);
  Put("DallyTimeout", 9000);
  Remove(TEXT("ReceiveTimeout"));

  EXPECT_FALSE(LoadSettings(settings));

  EXPECT_EQ(settings.max_session_retries, 3U);
  EXPECT_EQ(settings.receive_timeout_ms, 32000U);
  EXPECT_EQ(settings.dally_timeout_ms, 5000U) << "behind the missing one nothing is read";
}

TEST_F(SettingsTest, ReadsInOrderUpToWhicheverValueIsMissing) {
  std::uint32_t Settings::*const members[] = {&Settings::load_client,
                                              &Settings::authentication_enabled,
                                              &Settings::authentication_algorithm,
                                              &Settings::compression_enabled,
                                              &Settings::compression_algorithm,
                                              &Settings::encryption_enabled,
                                              &Settings::encryption_algorithm,
                                              &Settings::max_session_retries,
                                              &Settings::receive_timeout_ms,
                                              &Settings::dally_timeout_ms,
                                              &Settings::overrun_error_messages,
                                              &Settings::rx_blocks_before_overrun,
                                              &Settings::overrun_percent_threshold,
                                              &Settings::max_random_backoff};
  for (std::size_t missing = 0; missing < 14; ++missing) {
    Registry::DeleteKey(kKey);
    Settings settings;
    ASSERT_TRUE(LoadSettings(settings));
    for (std::size_t i = 0; i < 14; ++i) Put(kNumbers[i].first, 7000);
    const std::u16string name(kNumbers[missing].first.begin(), kNumbers[missing].first.end());
    Remove(name.c_str());

    EXPECT_FALSE(LoadSettings(settings)) << kNumbers[missing].first;

    for (std::size_t i = 0; i < 14; ++i) {
      const std::uint32_t expected = i < missing ? 7000 : kNumbers[i].second;
      EXPECT_EQ(settings.*members[i], expected) << i << " without " << missing;
    }
  }
}

TEST_F(SettingsTest, TakesAValueOfTheWrongTypeForAMissingOne) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  PutText("ReceiveTimeout", "9");
  Put("DallyTimeout", 9000);
  EXPECT_FALSE(LoadSettings(settings));
  EXPECT_EQ(settings.receive_timeout_ms, 32000U);
  EXPECT_EQ(settings.dally_timeout_ms, 5000U);

  PutText("ReceiveTimeout", "a text that does not fit into a number");
  EXPECT_FALSE(LoadSettings(settings));
  EXPECT_EQ(settings.receive_timeout_ms, 32000U);

  Put("ReceiveTimeout", 1000);
  PutText("RestoreFactoryDefaults", "yes");
  EXPECT_TRUE(LoadSettings(settings));
  EXPECT_EQ(settings.receive_timeout_ms, 1000U);
  EXPECT_EQ(Get("RestoreFactoryDefaults"), 0U);
}

TEST_F(SettingsTest, ReportsWhicheverCallFailsAndLeavesNothingOpen) {
  for (const bool first_use : {true, false}) {
    for (std::uint64_t nth = 1;; ++nth) {
      Registry::DeleteKey(kKey);
      Settings settings;
      if (!first_use) {
        ASSERT_TRUE(LoadSettings(settings));
      }
      const std::uint64_t fired = device().faults().fired();
      device().faults().Add({"*", nth, 1, ERROR_ACCESS_DENIED});
      const bool loaded = LoadSettings(settings);
      device().faults().Clear();
      const bool failed = device().faults().fired() > fired;
      // Closing is not looked at.
      if (!failed || device().faults().last_fired() == "RegCloseKey") {
        EXPECT_TRUE(loaded) << nth;
      } else {
        EXPECT_FALSE(loaded) << nth << " " << device().faults().last_fired();
      }
      EXPECT_EQ(settings.load_client, 1U) << "the defaults stand";
      if (!failed) break;
    }
  }
}

TEST_F(SettingsTest, RestoresEvenWhenTheKeyCannotBeDeleted) {
  Settings settings;
  ASSERT_TRUE(LoadSettings(settings));
  Put("RestoreFactoryDefaults", 1);
  Put("DallyTimeout", 9000);
  device().faults().Add({"RegDeleteKeyW"});

  EXPECT_TRUE(LoadSettings(settings));

  EXPECT_EQ(Get("DallyTimeout"), 5000U);
  EXPECT_EQ(Get("RestoreFactoryDefaults"), 0U);
}

// ---- the wrapper itself ----

TEST_F(SettingsTest, TheWrapperKnowsFourRootsByTheirNames) {
  Registry registry;
  for (const std::string root :
       {"HKEY_CLASSES_ROOT", "HKEY_CURRENT_USER", "HKEY_LOCAL_MACHINE", "HKEY_USERS"}) {
    EXPECT_EQ(registry.Open(root + "\\Test\\Key"), Outcome::kMissing) << root;
    EXPECT_TRUE(registry.Create(root + "\\Test\\Key")) << root;
    EXPECT_TRUE(registry.WriteDword("Number", 5));
    registry.Close();
    EXPECT_EQ(registry.Open(root + "\\Test\\Key"), Outcome::kDone) << root;
    std::uint32_t value = 0;
    EXPECT_EQ(registry.ReadDword("Number", value), Outcome::kDone);
    EXPECT_EQ(value, 5U);
    registry.Close();
    EXPECT_TRUE(Registry::DeleteKey(root + "\\Test\\Key"));
    EXPECT_FALSE(Registry::DeleteKey(root + "\\Test\\Key"));
  }
}

TEST_F(SettingsTest, TheWrapperRefusesPathsThatAreNone) {
  Registry registry;
  for (const std::string& path :
       {std::string(), std::string("HKEY_LOCAL_MACHINE"), std::string("HKEY_LOCAL_MACHINE\\"),
        std::string("Software\\X"), std::string("HKLM\\X"), std::string("hkey_local_machine\\X"),
        "HKEY_LOCAL_MACHINE\\" + std::string(300, 'x')}) {
    EXPECT_EQ(registry.Open(path), Outcome::kFailed) << path;
    EXPECT_FALSE(registry.Create(path)) << path;
    EXPECT_FALSE(Registry::DeleteKey(path)) << path;
  }
  std::uint32_t value = 7;
  EXPECT_NE(registry.ReadDword("x", value), Outcome::kDone) << "no key is open";
  EXPECT_FALSE(registry.WriteDword("x", 1));
  EXPECT_FALSE(registry.WriteString("x", "y"));
  EXPECT_EQ(value, 7U);
}

TEST_F(SettingsTest, TheWrapperRefusesNamesAndTextsThatAreTooLong) {
  Registry registry;
  ASSERT_TRUE(registry.Create("HKEY_LOCAL_MACHINE\\Test"));
  const std::string long_text(300, 'x');
  std::uint32_t value = 0;
  EXPECT_EQ(registry.ReadDword(long_text, value), Outcome::kFailed);
  EXPECT_FALSE(registry.WriteDword(long_text, 1));
  EXPECT_FALSE(registry.WriteString("x", long_text));
}

}  // namespace
