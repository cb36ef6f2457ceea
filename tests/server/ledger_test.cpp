#include "server/ledger.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace server {
namespace {

using ::testing::ElementsAre;
using ::testing::Key;

Request FileRequest(const std::string& path, const std::string& core_name = "",
                    const std::string& serial = "") {
  Request request;
  request.kind = RequestKind::kFile;
  request.path = path;
  request.identity.core_name = core_name;
  request.identity.serial = serial;
  return request;
}

TEST(DeviceLedgerTest, KnowsADeviceByCoreNameElseBySerialNumberElseByAddress) {
  DeviceLedger ledger;

  ledger.OnRequest(FileRequest("a", "MR7", "700"), "10.0.0.1", 1, Time{1});
  ledger.OnRequest(FileRequest("a", "", "701"), "10.0.0.1", 1, Time{2});
  ledger.OnRequest(FileRequest("a"), "10.0.0.1", 1, Time{3});

  EXPECT_THAT(ledger.devices(), ElementsAre(Key("10.0.0.1"), Key("701"), Key("MR7")));
}

TEST(DeviceLedgerTest, CountsWhatADeviceFetched) {
  DeviceLedger ledger;
  Request request = FileRequest("dir/a", "MR7");
  request.attempt = 3;
  request.total = 14;
  request.bundle_rx = 77;

  DeviceRecord& device = ledger.OnRequest(request, "10.0.0.1", 10, Time{5});
  ledger.OnBytes(device, "dir/a", 4, Time{6});
  ledger.OnAborted(device, "dir/a", 4, "gone", Time{7});
  ledger.OnRequest(request, "10.0.0.2", 10, Time{8});
  ledger.OnBytes(device, "dir/a", 10, Time{9});
  ledger.OnSent(device, "dir/a", 10, Time{9});

  EXPECT_EQ(device.requests, 2U);
  EXPECT_EQ(device.completed, 1U);
  EXPECT_EQ(device.aborted, 1U);
  EXPECT_EQ(device.bytes, 14U);
  EXPECT_EQ(device.attempt, 3U);
  EXPECT_EQ(device.total, 14U);
  EXPECT_EQ(device.bundle_rx, 77U);
  EXPECT_EQ(device.address, "10.0.0.2") << "the latest";
  EXPECT_EQ(device.first_seen, Time{5});
  EXPECT_EQ(device.last_seen, Time{9});
  EXPECT_EQ(device.files.at("dir/a").requests, 2U);
  EXPECT_EQ(device.files.at("dir/a").completed, 1U);
  EXPECT_EQ(device.files.at("dir/a").bytes, 14U);
}

TEST(DeviceLedgerTest, KeepsWhatADeviceOnceSaidWhenItsReportSaysLess) {
  DeviceLedger ledger;
  Request request = FileRequest("a", "MR7");
  request.identity.model = "TQ52";
  ledger.OnRequest(request, "10.0.0.1", 1, Time{1});
  Request report;
  report.kind = RequestKind::kReport;
  report.identity.core_name = "MR7";
  report.bundle_rx = 9;

  ledger.OnReport(report, "10.0.0.1", Time{2});

  const DeviceRecord& device = ledger.devices().at("MR7");
  EXPECT_EQ(device.identity.model, "TQ52");
  ASSERT_TRUE(device.report.has_value());
  EXPECT_EQ(device.report->bundle_rx, 9U);
}

TEST(DeviceLedgerTest, KeepsAStrangersInventedNamesFromFillingMemory) {
  DeviceLedger ledger(/*max_devices=*/3);

  for (int i = 0; i < 100; ++i) {
    ledger.OnNotFound(FileRequest("path" + std::to_string(i), "name" + std::to_string(i)),
                      "10.0.0.1", Time{i});
  }

  EXPECT_EQ(ledger.devices().size(), 4U);
  EXPECT_EQ(ledger.devices().at(std::string(DeviceLedger::kOthers)).not_found, 97U);
  EXPECT_TRUE(ledger.devices().at("name0").files.empty()) << "paths that do not exist are not kept";
}

TEST(DeviceLedgerTest, TellsItsListenerEachEventWithPrintablePaths) {
  DeviceLedger ledger;
  std::vector<std::string> told;
  ledger.SetListener([&told](const Event& event) {
    told.push_back(std::string(EventName(event.kind)) + "|" +
                   (event.device != nullptr ? event.device->key : "-") + "|" + event.path + "|" +
                   event.detail);
  });

  ledger.OnNotFound(FileRequest("a\x1B[31m", "MR7"), "10.0.0.1", Time{1});
  ledger.OnBadRequest("10.0.0.2", "not a request", Time{2});

  EXPECT_THAT(told, ElementsAre("not-found|MR7|a?[31m|", "bad-request|-||not a request"));
}

}  // namespace
}  // namespace server
