// The boot transfer byte by byte: what goes over the port, what the log says, and what is made of every wrong answer.
#include "download/boot/kivrat.h"

#include "handset/line/bytes.h"
#include "kral/download.h"
#include "kral/kivrat.h"
#include "tests/support/boot_wire.h"
#include "tests/support/failures.h"
#include "tests/support/phone_log.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;
using Texts = std::vector<std::string>;

// Hello of version 2: longest command 1,024, mode image transfer, six reserved words.
const std::string kHello =
    "01 00 00 00 30 00 00 00 02 00 00 00 01 00 00 00 00 04 00 00 00 00 00 00 "
    "A1 00 00 00 A2 00 00 00 A3 00 00 00 A4 00 00 00 A5 00 00 00 A6 00 00 00";
const std::string kReady = "0B 00 00 00 08 00 00 00";
const std::string kEnd = "04 00 00 00 10 00 00 00 0D 00 00 00 00 00 00 00";
const std::string kDone = "05 00 00 00 08 00 00 00";
const std::string kDoneResponse = "06 00 00 00 0C 00 00 00 00 00 00 00";

std::string HelloResponse(const std::string& mode) {
  return "02 00 00 00 30 00 00 00 02 00 00 00 01 00 00 00 00 00 00 00 " + mode +
         " 00 00 00 A1 00 00 00 A2 00 00 00 A3 00 00 00 A4 00 00 00 A5 00 00 00 A6 00 00 00";
}
const std::string kCommandResponse = HelloResponse("03");
const std::string kImageResponse = HelloResponse("00");
const std::string kExecute = "0D 00 00 00 0C 00 00 00 02 00 00 00";
const std::string kExecuteData = "0F 00 00 00 0C 00 00 00 02 00 00 00";
const std::string kSwitch = "0C 00 00 00 0C 00 00 00 00 00 00 00";
std::string ExecuteResponse(const std::string& length) {
  return "0E 00 00 00 10 00 00 00 02 00 00 00 " + length + " 00 00 00";
}
const std::string kIdentity = "11 11 11 11 E1 40 81 00 33 33 33 33 44 44 44 44 55 55 55 55 66 66 66 66";

std::string ReadRequest(uint32_t offset, uint32_t length) {
  return HexText(handset::ByteWriter().U32(3).U32(20).U32(13).U32(offset).U32(length).Take());
}

class KivratWire : public test::BootWireTest {
 protected:
  void SetUp() override {
    BootWireTest::SetUp();
    log_ = std::make_unique<test::PhoneLog>(handle_, KRAL_LOG_ERR | KRAL_LOG_RET);
  }
  void TearDown() override {
    log_.reset();
    BootWireTest::TearDown();
  }

  void Target(const Texts& says, bool byte_by_byte = false) {
    log_->Take();
    written_before_ = wire_.Written().size();
    std::vector<Bytes> bytes;
    for (const std::string& text : says) bytes.push_back(FromHex(text));
    Say(std::move(bytes), byte_by_byte);
  }

  Texts Written() const {
    Texts texts;
    const auto all = wire_.Written();
    for (size_t i = written_before_; i < all.size(); ++i) texts.push_back(HexText(all[i]));
    return texts;
  }

  // Lines of one flag, without it.
  Texts Lines(const std::string& flag) {
    Texts texts;
    for (const std::string& line : log_->lines()) {
      if (line.starts_with(flag + " ")) texts.push_back(line.substr(flag.size() + 1));
    }
    return texts;
  }
  bool HasError(const std::string& text) { return log_->Has("16 " + text); }

  std::unique_ptr<test::PhoneLog> log_;
  size_t written_before_ = 0;
  test::TempFolder folder_;
};

TEST_F(KivratWire, ConnectReadsTheIdentityAndEntersImageTransfer) {
  for (const bool byte_by_byte : {false, true}) {
    Target({kHello, kReady, ExecuteResponse("18"), kIdentity, kHello}, byte_by_byte);
    uint32_t version = 0;
    std::optional<uint32_t> identity;
    EXPECT_TRUE(kivrat::Connect(*phone_, version, &identity));
    EXPECT_EQ(version, 2u);
    EXPECT_EQ(identity, 0x008140E1u);
    EXPECT_EQ(Written(), (Texts{kCommandResponse, kExecute, kExecuteData, kSwitch, kImageResponse}));
    EXPECT_EQ(Lines("4"),
              (Texts{"Kivrat Hello recieved from the device\n", "Kivrat Hello Response sent to the device\n",
                     "Kivrat command execute sent to the device\n", "BXC ID read from PBL: 8470753 \r \n",
                     "Kivrat swtich mode sent to the device\n", "Kivrat Hello recieved from the device\n",
                     "Kivrat Hello Response sent to the device\n"}));
    EXPECT_TRUE(phone_->port_borrowed()) << "the target will ask for its image";
  }
}

TEST_F(KivratWire, ConnectWithoutAnIdentityOnlyAnswersTheHello) {
  std::string hello = kHello;
  hello.replace(20 * 3, 2, "02");  // whatever mode the target is in comes back
  Target({hello});
  uint32_t version = 0;
  EXPECT_TRUE(kivrat::Connect(*phone_, version, nullptr));
  EXPECT_EQ(Written(), Texts{HelloResponse("02")});
}

TEST_F(KivratWire, IdentityWithoutDataEndsTheConnectWithSuccess) {
  Target({kHello, kReady, ExecuteResponse("00")});
  uint32_t version = 0;
  std::optional<uint32_t> identity = 1;
  EXPECT_TRUE(kivrat::Connect(*phone_, version, &identity));
  EXPECT_EQ(version, 2u);
  EXPECT_EQ(identity, std::nullopt);
  EXPECT_EQ(Written(), (Texts{kCommandResponse, kExecute}));
}

TEST_F(KivratWire, IdentityNeedsItsSecondWordOnly) {
  struct Row {
    const char* told;
    std::string sent;
    bool known;
  };
  // What is told beforehand does not bound the one read: it takes what comes, up to 24 bytes.
  for (const Row& row : {Row{"08", kIdentity.substr(0, 8 * 3), true}, Row{"18", kIdentity.substr(0, 8 * 3), true},
                         Row{"08", kIdentity, true}, Row{"04", kIdentity, true},
                         Row{"30", kIdentity + "77 77 77 77", true}, Row{"07", kIdentity.substr(0, 7 * 3), false}}) {
    Target({kHello, kReady, ExecuteResponse(row.told), row.sent, kHello});
    uint32_t version = 0;
    std::optional<uint32_t> identity;
    EXPECT_EQ(kivrat::Connect(*phone_, version, &identity), row.known) << row.told;
    EXPECT_EQ(identity.value_or(0), row.known ? 0x008140E1u : 0u);
  }
}

TEST_F(KivratWire, IdentityDataThatComeLateAreNotTakenForTheHello) {
  Bytes late = FromHex(kIdentity);
  Target({kHello, kReady, ExecuteResponse("30"), kIdentity});
  phone_->state<kivrat::Settings>().read_time_out_ms = 5000;
  // They come while they are waited for, else right in front of the hello.
  const kivrat::Stop come_late = [&] {
    if (says_.empty()) wire_.ToHost(std::exchange(late, {}));
    return false;
  };
  wire_.OnWrite([&](const Bytes& written) {
    if (HexText(written) != kSwitch) return SayNext();
    Bytes bytes = std::exchange(late, {});
    const Bytes hello = FromHex(kHello);
    bytes.insert(bytes.end(), hello.begin(), hello.end());
    return bytes;
  });
  uint32_t version = 0;
  std::optional<uint32_t> identity;
  EXPECT_TRUE(kivrat::Connect(*phone_, version, &identity, come_late));
  EXPECT_EQ(identity, 0x008140E1u);
}

// What the target says, the line and the record that it leaves, and how often the host has written by then.
struct WrongAnswer {
  Texts says;
  std::string line;
  std::string record;  // behind the function's name
  std::string text;
  size_t written;
};

TEST_F(KivratWire, EveryWrongOrMissingAnswerEndsTheConnect) {
  const std::string read_failed = "Failed to read the Port buffer\n";
  const std::string no_hello = "The packet recieved from the device is not a HELLO_REQ";
  const std::string no_answer = "The packet received from the device is not an execute response";
  const std::string not_ready = "The command mode is not ready \r \n";
  std::string long_hello = kHello;
  long_hello.replace(4 * 3, 2, "31");
  const std::string execute = ExecuteResponse("18");
  const WrongAnswer rows[] = {
      {{""}, read_failed, "NO_ANSWER", "hello of the boot loader did not come", 0},
      {{kHello.substr(0, 40 * 3)}, read_failed, "LINK", "40 of 48 bytes", 0},
      {{"07" + kHello.substr(2)}, no_hello, "LINK LOADER 7", "instead of a hello", 0},
      {{long_hello}, no_hello, "LINK LOADER 1", "", 0},
      {{kHello}, not_ready, "NO_ANSWER", "", 1},
      {{kHello, "0A" + kReady.substr(2)}, not_ready, "LINK LOADER 10", "instead of its readiness", 1},
      {{kHello, kReady}, read_failed, "NO_ANSWER", "", 2},
      {{kHello, kReady, "0D" + execute.substr(2)}, no_answer, "LINK LOADER 13", "", 2},
      {{kHello, kReady, execute}, read_failed, "NO_ANSWER", "chip identity", 3},
      {{kHello, kReady, execute, kIdentity}, read_failed, "NO_ANSWER", "hello", 4},
      {{kHello, kReady, execute, kIdentity, "02" + kHello.substr(2)}, no_hello, "LINK LOADER 2", "", 4},
  };
  for (const WrongAnswer& row : rows) {
    uint32_t version = 77;
    uint32_t identity = 77;
    const auto connect = [&] {
      Target(row.says);
      return KRAL_Kivrat_Connect(handle_, &version, &identity);
    };
    test::ExpectFailures(handle_, {{"KRAL_Kivrat_Connect " + row.record, row.text, connect}});
    EXPECT_EQ(version + identity, 77u + 77u);
    EXPECT_TRUE(HasError(row.line)) << row.line;
    EXPECT_EQ(Written().size(), row.written) << "nothing is sent again";
    EXPECT_FALSE(phone_->port_borrowed());
  }
}

TEST_F(KivratWire, FailedWritesAreToldOfTheirPacket) {
  const auto connect = [this] {
    Target({kHello});
    return KRAL_Kivrat_Connect(handle_, nullptr, nullptr);
  };
  const auto serve = [this](const std::string& says) {
    Target({says});
    return KRAL_Kivrat_DownloadFlashProgrammer(handle_, folder_.Add("file", "abcdef").c_str());
  };
  wire_.FailWrites(true);
  test::ExpectFailures(handle_, {{"KRAL_Kivrat_Connect LINK", "answer to the hello could not be written", connect}});
  EXPECT_TRUE(HasError("Failed to write to the KIVRAT_HELLO_RSP from the host to the Device"));
  test::ExpectFailures(handle_, {{"KRAL_Kivrat_DownloadFlashProgrammer LINK offset 0", "could not be written",
                                  [&] { return serve(ReadRequest(0, 4)); }}});
  EXPECT_TRUE(HasError("Failed to send the command from the host to the device \r \n"));
  EXPECT_EQ(serve(kEnd), 0);
  EXPECT_TRUE(HasError("Failed to send the KIVRAT_DONE_REQ (command -> 5) as expected \r\n"));
}

TEST_F(KivratWire, HelloRetriesWaitForATargetThatIsLate) {
  ASSERT_TRUE(phone_->BorrowPort());
  phone_->state<kivrat::Settings>().hello_retries = 3;
  phone_->state<kivrat::Settings>().retry_delay_ms = 1;
  uint32_t version = 0;
  EXPECT_FALSE(kivrat::Connect(*phone_, version, nullptr));
  EXPECT_EQ(Lines("16"), Texts(4, "Failed to read the Port buffer\n"));
  // A target that says hello between two tries is heard; a caller that gives up is obeyed.
  Target({""});
  phone_->state<kivrat::Settings>().read_time_out_ms = 0;
  const kivrat::Stop arrive = [&, looks = 0]() mutable {
    if (++looks == 3) wire_.ToHost(FromHex(kHello));
    return false;
  };
  EXPECT_TRUE(kivrat::Connect(*phone_, version, nullptr, arrive));
  EXPECT_FALSE(kivrat::Connect(*phone_, version, nullptr, [] { return true; }));
  EXPECT_EQ(Lines("16").back(), "Failed to read the Port buffer\n");
}

TEST_F(KivratWire, ProgrammerIsServedInOrderWhateverTheOffsets) {
  const std::string file = folder_.Add("programmer", "0123456789");
  phone_->state<kivrat::Settings>().pre_done_delay_ms = 1;
  for (const bool byte_by_byte : {false, true}) {
    // Offsets 0, 100, 2; the last request goes beyond the end of the file, which gives what it has.
    Target({ReadRequest(0, 4), ReadRequest(100, 3), ReadRequest(2, 131072), kEnd, kDoneResponse}, byte_by_byte);
    std::vector<std::pair<uint64_t, uint64_t>> progress;
    EXPECT_TRUE(kivrat::DownloadFlashProgrammer(*phone_, file, [&](uint64_t done, uint64_t total) {
      progress.emplace_back(done, total);
      return true;
    }));
    EXPECT_EQ(Written(), (Texts{"30 31 32 33", "34 35 36", "37 38 39", kDone}));
    EXPECT_EQ(progress, (std::vector<std::pair<uint64_t, uint64_t>>{{0, 10}, {4, 10}, {7, 10}, {10, 10}}));
    EXPECT_TRUE(log_->Has("4 Waiting 1 ms before Kivrat Done"));
    EXPECT_TRUE(log_->Has("4 Flash programmer successfully downloaded using Kivrat Protocol!\n"));
    EXPECT_EQ(Lines("16"), Texts());
    EXPECT_FALSE(phone_->port_borrowed());
  }
}

TEST_F(KivratWire, PacketsMayBeLongerThanTheirFieldsUpToTheBuffer) {
  Bytes request = FromHex(ReadRequest(0, 4));
  request.resize(128 << 10, 0xEE);
  request[4] = 0;
  request[6] = 2;
  Target({"", kEnd, kDoneResponse});
  wire_.ToHost(request);
  EXPECT_TRUE(kivrat::DownloadFlashProgrammer(*phone_, folder_.Add("file", "abcdef")));
  EXPECT_EQ(Written(), (Texts{"61 62 63 64", kDone}));
}

TEST_F(KivratWire, EveryWrongOrMissingAnswerEndsTheTransfer) {
  const std::string read_failed = "Failed to read the command from the opened port \r \n";
  const std::string no_answer = "Failed to recieve the KIVRAT_DONE_RSP as expected \r\n";
  const auto header = [](uint32_t command, uint32_t length) {
    return HexText(handset::ByteWriter().U32(command).U32(length).Take());
  };
  const WrongAnswer rows[] = {
      {{""}, read_failed, "NO_ANSWER", "next request", 0},
      {{"03 00 00 00"}, read_failed, "LINK", "4 of 8 bytes", 0},
      {{ReadRequest(0, 4).substr(0, 19 * 3)}, read_failed, "LINK", "", 0},
      {{header(4, 7)}, read_failed, "LINK", "7 bytes", 0},
      {{header(4, 131073)}, read_failed, "LINK", "131073 bytes", 0},
      {{header(3, 0xFFFFFFFF)}, read_failed, "LINK", "", 0},
      {{header(3, 8)}, "Kivrat: a request for 0 bytes", "LINK", "", 0},
      {{ReadRequest(0, 131073)}, "Kivrat: a request for 131073 bytes", "LINK", "131073 bytes", 0},
      {{ReadRequest(0, 6), ReadRequest(6, 1)},
       "Kivrat: the file has no more than 6 bytes, 1 are asked for at 6",
       "BAD_FILE offset 6",
       "after 6 bytes",
       1},
      {{ReadRequest(0, 2), header(7, 8)},
       "Recieved 7 instead of KIVRAT_END_TRANSFER (command -> 4) \r\n",
       "LINK LOADER 7",
       "packet 7",
       1},
      {{kEnd}, no_answer, "NO_ANSWER", "answer to the end", 1},
      {{kEnd, "05" + kDoneResponse.substr(2)},
       "Recieved 5 instead of KIVRAT_DONE_RSP (command -> 6) \r\n",
       "LINK LOADER 5",
       "packet 5",
       1},
      {{kEnd, "06 00 00 00 0D 00 00 00 00 00 00 00"}, "Kivrat: a packet of 13 bytes", "LINK", "13 bytes", 1},
  };
  const auto file = folder_.Add("file", "abcdef");
  for (const WrongAnswer& row : rows) {
    const auto serve = [&] {
      Target(row.says);
      return KRAL_Kivrat_DownloadFlashProgrammer(handle_, file.c_str());
    };
    test::ExpectFailures(handle_, {{"KRAL_Kivrat_DownloadFlashProgrammer " + row.record, row.text, serve}});
    EXPECT_TRUE(HasError(row.line)) << row.line;
    EXPECT_EQ(Written().size(), row.written);
    EXPECT_FALSE(phone_->port_borrowed());
  }
}

TEST_F(KivratWire, RequestsForNothingGetNothingAndMayNotGoOnForEver) {
  const std::string file = folder_.Add("programmer", "0123456789");
  const std::string nothing = ReadRequest(0, 0) + " ";
  Target({nothing + ReadRequest(0, 4), nothing + nothing + ReadRequest(4, 6), nothing + kEnd, kDoneResponse});
  EXPECT_TRUE(kivrat::DownloadFlashProgrammer(*phone_, file));
  EXPECT_EQ(Written(), (Texts{"30 31 32 33", "34 35 36 37 38 39", kDone}));
  std::string many;
  for (int i = 0; i < 200; ++i) many += nothing;
  Target({many + kEnd, kDoneResponse});
  EXPECT_FALSE(kivrat::DownloadFlashProgrammer(*phone_, file));
  EXPECT_TRUE(HasError("Kivrat: a request for 0 bytes, and 99 before it"));
  Target({many + kEnd});
  EXPECT_FALSE(
      kivrat::DownloadFlashProgrammer(*phone_, file, [looks = 0](uint64_t, uint64_t) mutable { return ++looks < 5; }));
  EXPECT_TRUE(HasError("Kivrat: the transfer was aborted"));
}

TEST_F(KivratWire, TransferNeedsAConnectAndAFile) {
  const std::string name = "KRAL_Kivrat_DownloadFlashProgrammer";
  const auto serve = [this](const std::string& file) {
    return [=, this] { return KRAL_Kivrat_DownloadFlashProgrammer(handle_, file.c_str()); };
  };
  const auto file = folder_.Add("file", "abc");
  test::ExpectFailures(handle_, {{name + " ARGUMENT", "no boot loader", serve(file)}});
  EXPECT_TRUE(HasError("Failed KivratInit()"));
  Target({""});
  test::ExpectFailures(handle_, {{name + " BAD_FILE", "missing cannot be opened", serve(folder_.Path("missing"))},
                                 {name + " BAD_FILE", "", serve(folder_.Path(""))}});
  EXPECT_EQ(Lines("16").size(), 2u);
  // Nothing has happened to the target, which takes the right file now.
  EXPECT_TRUE(phone_->port_borrowed());
  Target({ReadRequest(0, 3), kEnd, kDoneResponse});
  EXPECT_EQ(serve(file)(), 1);
}

TEST_F(KivratWire, CallerEndsTheTransferBetweenTwoPieces) {
  Target({ReadRequest(0, 2), ReadRequest(2, 2)});
  const auto file = folder_.Add("file", "abcdef");
  const auto abort = [](KRAL_HANDLE handle, uint32_t done, uint32_t, uintptr_t) {
    if (done >= 4) KRAL_AbortDownload(handle);
  };
  KRAL_ConfigureDownloadCallBack(handle_, abort, 0);
  test::ExpectFailures(handle_, {{"KRAL_Kivrat_DownloadFlashProgrammer ABORTED", "aborted",
                                  [&] { return KRAL_Kivrat_DownloadFlashProgrammer(handle_, file.c_str()); }}});
  EXPECT_TRUE(HasError("Kivrat: the transfer was aborted"));
  EXPECT_EQ(Written(), (Texts{"61 62", "63 64"}));
}

TEST(KivratPort, DevicesAreGivenPiecesThatTheirDriversHold) {
  test::TestWire wire;
  Diag_FTM phone(7, SystemClock(), wire.AsDevice());
  const test::TempFolder folder;
  const std::string data(10000, 'x');
  ASSERT_TRUE(phone.BorrowPort());
  phone.state<kivrat::Settings>().read_time_out_ms = 20;
  wire.ToHost(FromHex(ReadRequest(0, 131072)));
  EXPECT_FALSE(kivrat::DownloadFlashProgrammer(phone, folder.Add("file", data)));
  std::vector<size_t> sizes;
  for (const Bytes& piece : wire.Written()) sizes.push_back(piece.size());
  EXPECT_EQ(sizes, (std::vector<size_t>{4096, 4096, 1808}));
  // A device that goes ends the waiting at once.
  phone.state<kivrat::Settings>().read_time_out_ms = 60000;
  ASSERT_TRUE(phone.BorrowPort());
  wire.Vanish(true);
  EXPECT_FALSE(kivrat::DownloadFlashProgrammer(phone, folder.Path("file")));
}

}  // namespace
}  // namespace kral
