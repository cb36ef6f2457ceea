// Whether a storage card takes part in a job.
#pragma once

#include <cstdint>
#include <string_view>

#include "orvenix/upgrade_config.h"

namespace upgrade {

/// The folders of the cards, in the order in which they are tried.
inline constexpr std::string_view kCardFolders[] = {"\\SDMMC Disk", "\\Storage Card", "\\SD Card"};

/// Whether `path` lies on a card. Letter case counts.
[[nodiscard]] bool IsOnCard(std::string_view path) noexcept;

/// Whether a package of this pass needs the card of folder `prefix` and the card has room for it.
// KEPT ODDITY: whichever card is meant, the room asked for is that of "\SDMMC Disk\SubFolder" and,
// where that gives no answer, of "\Storage Card\SubFolder".
[[nodiscard]] bool FindStorageCard(const UpgradeConfig& job, std::int32_t pass,
                                   std::string_view prefix) noexcept;

/// Tries the cards one by one. @return whether one serves the job.
[[nodiscard]] bool ProbeStorageCards(const UpgradeConfig& job, std::int32_t pass) noexcept;

}  // namespace upgrade
