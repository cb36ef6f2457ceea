#include "loader/host_callbacks.h"

#include <atomic>
#include <cstdint>
#include <deque>
#include <mutex>

#include "loader/gates.h"
#include "orvenix/configlet.h"

namespace loader {
namespace {

using SetCallbacks = std::uint32_t (*)(std::uintptr_t context, const IcfgCallbacks* table);

/// What the library gets in place of the host's table.
struct Table {
  IcfgCallbacks shown;        ///< first: the library passes its address to PassOn
  const IcfgCallbacks* host;  ///< the table in whose place it stands
};

std::atomic<SetCallbacks> library{nullptr};

std::mutex tables_mutex;
std::deque<Table> tables;  ///< the library keeps their addresses

int PassOn(std::uintptr_t context, const char* text, std::int32_t length,
           const IcfgCallbacks* table) {
  const IcfgCallbacks* const host = reinterpret_cast<const Table*>(table)->host;
  return host->set_data(context, text, length, host);
}

std::uint32_t SetThroughGate(std::uintptr_t context, const IcfgCallbacks* table) {
  if (table == nullptr) return library.load()(context, nullptr);
  const Table* given = nullptr;
  {
    const std::lock_guard<std::mutex> hold(tables_mutex);
    tables.push_back({*table, table});
    if (table->set_data != nullptr) {
      tables.back().shown.set_data = reinterpret_cast<decltype(table->set_data)>(
          LastingGate(Gate::Kind::kOut, reinterpret_cast<Function>(&PassOn)));
    }
    given = &tables.back();
  }
  return library.load()(context, &given->shown);
}

}  // namespace

Function CallbacksThroughGates(Function set_callbacks) {
  library = reinterpret_cast<SetCallbacks>(set_callbacks);
  return reinterpret_cast<Function>(&SetThroughGate);
}

const IcfgCallbacks* HostTable(const IcfgCallbacks* given) {
  const std::lock_guard<std::mutex> hold(tables_mutex);
  for (const Table& table : tables) {
    if (&table.shown == given) return table.host;
  }
  return given;
}

}  // namespace loader
