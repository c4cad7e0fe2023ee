// Traces through the exported functions: of a port that closes and opens again, files that are in use or gone, and what
// was kept.
#include "kral/diag.h"
#include "kral/error.h"
#include "kral/log.h"
#include "kral/transport.h"
#include "tests/support/handset_ports.h"
#include "tests/support/pcapng_reading.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

test::PcapngReading Read(const test::TempFolder& folder, const std::string& name) {
  const std::string content = folder.Content(name);
  return test::PcapngReading({content.begin(), content.end()});
}

// "> 27" for a request with that code, "< 27" for an answer.
std::vector<std::string> Codes(const test::PcapngReading& reading) {
  std::vector<std::string> codes;
  for (const auto& packet : reading.packets) {
    codes.push_back((packet.sent() ? "> " : "< ") + (packet.data.empty() ? "" : std::to_string(packet.data[0])));
  }
  return codes;
}

class TracedPort : public testing::Test {
 protected:
  bool Ask() {
    uint16_t switches = 0;
    return KRAL_DIAG_GET_DIPSW_F(handle_, &switches) == 1;
  }
  bool Start(const std::string& name) { return KRAL_StartTrace(handle_, folder_.Path(name).c_str()) == 1; }
  uint32_t Why() {
    KRAL_ERROR record{};
    return KRAL_GetLastError(handle_, &record) == 1 ? record.code : 0;
  }

  test::TempFolder folder_;
  test::HandsetPorts ports_;
  handset::VirtualHandset& handset_ = ports_.Add(7);
  const KRAL_HANDLE handle_ = KRAL_ConnectServer(7);
};

TEST_F(TracedPort, IsTracedWhileItClosesAndOpensAgain) {
  ASSERT_TRUE(Start("trace"));
  EXPECT_TRUE(Ask());
  handset_.Expect("2F");
  KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_COMMAND, 20);
  EXPECT_FALSE(Ask());
  EXPECT_FALSE(ports_.IsOpen(7));
  KRAL_ConfigureTimeOut(handle_, KRAL_TIME_OUT_COMMAND, 4000);
  EXPECT_TRUE(Ask());
  EXPECT_EQ(KRAL_StopTrace(handle_), 1);
  EXPECT_TRUE(Ask()) << "what comes after the end is not in the file";
  const auto trace = Read(folder_, "trace");
  ASSERT_EQ(Codes(trace), (std::vector<std::string>{"> 47", "< 47", "> 47", "> 47", "< 47"}));
  EXPECT_EQ(trace.interfaces.at(0), (std::pair<uint16_t, std::string>{147, "COM7"}));
  EXPECT_EQ(trace.packets.at(3).comment, "the port was opened");
  uint64_t before = 0;
  for (const auto& packet : trace.packets) EXPECT_GE(packet.microseconds, std::exchange(before, packet.microseconds));
  KRAL_TRACE_COUNTERS counters{};
  ASSERT_EQ(KRAL_GetTraceCounters(handle_, &counters), 1);
  EXPECT_EQ(counters.frames, 5u);
  EXPECT_EQ(counters.lost + counters.pending + counters.others + counters.bad, 0u);
}

TEST_F(TracedPort, FilesInUseAndFoldersThatAreNotThereAreRefused) {
  EXPECT_FALSE(Start("no/such/folder"));
  EXPECT_EQ(Why(), uint32_t{KRAL_ERROR_BAD_FILE});
  ASSERT_TRUE(Start("trace"));
  EXPECT_FALSE(Start("another")) << "one at a time";
  EXPECT_EQ(Why(), uint32_t{KRAL_ERROR_ARGUMENT});
  EXPECT_EQ(KRAL_KeepTrace(handle_, 1000), 0);
  ports_.Add(8);
  const KRAL_HANDLE other = KRAL_ConnectServer(8);
  EXPECT_EQ(KRAL_StartTrace(other, folder_.Path("trace").c_str()), 0) << "half of each would be lost";
  EXPECT_EQ(KRAL_StartCapture(other, folder_.Path("trace").c_str()), 0);
  EXPECT_EQ(KRAL_StopTrace(other), 0);
  EXPECT_TRUE(Ask());
  EXPECT_EQ(KRAL_StopTrace(handle_), 1);
  EXPECT_EQ(Codes(Read(folder_, "trace")).size(), 2u);
  EXPECT_EQ(KRAL_StopTrace(handle_), 0);

  // A folder that is taken away costs the file, not the connection.
  const std::string folder = folder_.Path("gone");
  std::filesystem::create_directory(folder);
  ASSERT_TRUE(Start("gone/trace"));
  std::error_code ignored;
  std::filesystem::remove_all(folder, ignored);
  EXPECT_TRUE(Ask());
  KRAL_StopTrace(handle_);
  EXPECT_TRUE(Ask());
}

TEST_F(TracedPort, LatestTrafficIsKeptUntilItIsWanted) {
  EXPECT_EQ(KRAL_SaveTrace(handle_, folder_.Path("none").c_str()), 0) << "nothing is kept";
  ASSERT_EQ(KRAL_KeepTrace(handle_, 100000), 1);
  EXPECT_FALSE(Start("trace")) << "one of the two";
  EXPECT_TRUE(Ask());
  EXPECT_EQ(KRAL_SaveTrace(handle_, folder_.Path("no/such/folder").c_str()), 0);
  EXPECT_EQ(Why(), uint32_t{KRAL_ERROR_BAD_FILE});
  EXPECT_EQ(KRAL_SaveTrace(handle_, folder_.Path("trace").c_str()), 1);
  EXPECT_TRUE(Ask());
  EXPECT_EQ(KRAL_SaveTrace(handle_, folder_.Path("later").c_str()), 1);
  EXPECT_EQ(Codes(Read(folder_, "trace")), (std::vector<std::string>{"> 47", "< 47"}));
  EXPECT_EQ(Codes(Read(folder_, "later")).size(), 4u);
  EXPECT_EQ(KRAL_StopTrace(handle_), 1);
  EXPECT_TRUE(Start("trace"));
  KRAL_DisconnectServer(handle_);
  EXPECT_TRUE(Read(folder_, "trace").whole) << "the release of the handle ends it";
}

TEST_F(TracedPort, BytesWithoutFramesAreTold) {
  ASSERT_TRUE(Start("trace"));
  ASSERT_EQ(KRAL_SetPacketMode(handle_, KRAL_PACKET_MODE_UNFRAMED_2), 1);
  const std::array<uint8_t, 3> request = {'A', 'T', 0x7E};
  EXPECT_EQ(KRAL_SendASync(handle_, request.size(), request.data(), 100, 0), 1);
  EXPECT_EQ(KRAL_StopTrace(handle_), 1);
  const auto trace = Read(folder_, "trace");
  ASSERT_EQ(trace.packets.size(), 1u);
  EXPECT_EQ(trace.packets[0].interface, 1u);
  EXPECT_EQ(trace.packets[0].data, (std::vector<uint8_t>{'A', 'T', 0x7E}));
}

}  // namespace
}  // namespace kral
