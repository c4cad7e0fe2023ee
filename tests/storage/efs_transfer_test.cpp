// Transfers between the PC and the handset: what goes over the wire, what ends up on either side, and what fails.
#include "tests/support/efs_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

class EfsTransfer : public test::EfsTest {
 protected:
  // The requests since the trace was last cleared that carry a command, without the 4 header bytes.
  std::vector<Bytes> RequestsOf(uint8_t command) {
    std::vector<Bytes> found;
    for (const Bytes& request : handset().requests()) {
      if (request[2] == command) found.emplace_back(request.begin() + 4, request.end());
    }
    return found;
  }
  uint8_t ReadMem(const char* path, Bytes& data) {
    auto size = static_cast<uint32_t>(data.size());
    const uint8_t result = KRAL_EfsReadMem(handle(), path, data.data(), &size);
    if (result == 1) data.resize(size);
    return result;
  }

  test::TempFolder folder_;
};

// The calls of the transfer callback, as "operation done/total".
std::vector<std::string> g_progress;
uint32_t g_abort_at = 0;

void KRAL_CALL NoteProgress(uintptr_t, uintptr_t, uint32_t operation, uint32_t reserved, uint32_t done, uint32_t total,
                            KRAL_HANDLE context) {
  g_progress.push_back(std::to_string(operation) + " " + std::to_string(done) + "/" + std::to_string(total));
  if (reserved != 0) g_progress.push_back("reserved is not 0");
  if (g_abort_at != 0 && g_progress.size() == g_abort_at) KRAL_AbortEFS_Operation(context);
}

TEST_F(EfsTransfer, WritesChunkByChunk) {
  const Bytes data = RandomBytes(1300);
  const std::string local = folder_.Add("local", Text(data));
  KRAL_StartLogging(handle(), folder_.Path("log").c_str());
  EXPECT_EQ(KRAL_EfsWrite(handle(), local.c_str(), "/file"), 1) << LogText();
  KRAL_StopLogging(handle());
  EXPECT_EQ(handset().efs().File("/file"), data);
  EXPECT_EQ(handset().efs().Mode("/file"), 0x8000u | 0666u);

  std::vector<uint8_t> commands;
  for (const Bytes& request : handset().requests()) commands.push_back(request[2]);
  EXPECT_EQ(commands, (std::vector<uint8_t>{19, 15, 2, 5, 5, 5, 3}));
  EXPECT_EQ(RequestsOf(2)[0], ByteWriter().U32(0x241).U32(0666).Terminated("/file").Take());
  const auto writes = RequestsOf(5);
  const size_t kChunks[] = {512, 512, 276};
  size_t offset = 0;
  for (size_t i = 0; i < std::size(kChunks); ++i) {
    EXPECT_EQ(writes[i], ByteWriter()
                             .U32(0)
                             .U32(static_cast<uint32_t>(offset))
                             .Raw(handset::ByteView(data).subspan(offset, kChunks[i]))
                             .Take());
    offset += kChunks[i];
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, " EFS Write Transferred " + std::to_string(offset) + " / 1300 bytes"));
  }
  EXPECT_EQ(RequestsOf(3)[0], ByteWriter().U32(0).Take());
  EXPECT_TRUE(HasLine(KRAL_LOG_C_HIGH_LEVEL_START, "KRAL_EfsWrite( sLocalFile = " + local + ", sEFS_File = /file)"));
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "KRAL_EfsWrite() - PASS"));
}

TEST_F(EfsTransfer, ReadsChunkByChunk) {
  const Bytes data = RandomBytes(1300);
  handset().efs().AddFile("/file", data);
  EXPECT_EQ(KRAL_EfsRead(handle(), folder_.Path("local").c_str(), "/file"), 1) << LogText();
  EXPECT_EQ(folder_.Content("local"), Text(data));

  EXPECT_EQ(RequestsOf(2)[0], ByteWriter().U32(0).U32(0444).Terminated("/file").Take());
  EXPECT_EQ(RequestsOf(4), (std::vector<Bytes>{ByteWriter().U32(0).U32(516).U32(0).Take(),
                                               ByteWriter().U32(0).U32(516).U32(516).Take(),
                                               ByteWriter().U32(0).U32(516).U32(1032).Take()}));
  for (const char* done : {"516", "1032", "1300"}) {
    EXPECT_TRUE(HasLine(KRAL_LOG_RET, std::string(" EFS Read Transferred ") + done));
  }
}

TEST_F(EfsTransfer, EverySizeArrivesWhole) {
  for (const size_t size : {0, 1, 511, 512, 513, 516, 1024, 1032, 5000}) {
    SCOPED_TRACE(size);
    const Bytes data = RandomBytes(size, static_cast<uint32_t>(size));
    EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), static_cast<uint32_t>(size), "/f"), 1);
    EXPECT_EQ(handset().efs().File("/f"), data);
    Bytes back(size);
    EXPECT_EQ(ReadMem("/f", back), 1);
    EXPECT_EQ(back, data);
    Bytes roomy(size + 1000);
    EXPECT_EQ(ReadMem("/f", roomy), 1);
    EXPECT_EQ(roomy, data);
    if (size == 0) continue;
    Bytes tight(size - 1);
    EXPECT_EQ(ReadMem("/f", tight), 0);
  }
}

TEST_F(EfsTransfer, PacketSizesAreTheCallers) {
  const Bytes data = RandomBytes(5000);
  EXPECT_EQ(KRAL_SetEfsReadAndWritePacketSize(handle(), 1024, 1024), 1);
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 5000, "/f"), 1);
  EXPECT_EQ(RequestsOf(5)[0].size(), 8u + 1012u);
  Bytes back(5000);
  EXPECT_EQ(ReadMem("/f", back), 1);
  EXPECT_EQ(RequestsOf(4)[0], ByteWriter().U32(0).U32(1004).U32(0).Take());

  for (const auto& [read_size, write_size] : {std::pair<uint16_t, uint16_t>{4091, 6143}, {21, 13}}) {
    KRAL_SetEfsReadAndWritePacketSize(handle(), read_size, write_size);
    const uint32_t size = write_size > 1000 ? 5000 : 40;
    EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), size, "/f"), 1);
    EXPECT_EQ(handset().efs().File("/f"), Bytes(data.begin(), data.begin() + size));
    back.assign(5000, 0);
    EXPECT_EQ(ReadMem("/f", back), 1);
    EXPECT_EQ(back, Bytes(data.begin(), data.begin() + size));
  }
}

// The sizes of the packets of a put and a get: of 20,000 bytes each, and how many of each came first.
struct FoundSizes {
  const char* name;
  Fault fault;
  When when;
  std::vector<size_t> writes, writes_again;  // bytes of data, the first ones; again: of the next transfer
  std::vector<uint32_t> reads, reads_again;  // bytes asked for
};

class EfsPacketSizes : public EfsTransfer {
 protected:
  void SetUp() override {
    EfsTransfer::SetUp();
    ConnectAnew();
  }
  void ConnectAnew() {
    Connect();
    KRAL_SetReceiveMode(handle(), 1);
    KRAL_SetEfsAutomaticPacketSize(handle(), 1);
    ShortenTimeOuts(100);
  }
  void PutAndGet(const Bytes& data) {
    handset().ClearTrace();
    EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), static_cast<uint32_t>(data.size()), "/f"), 1) << LogText();
    EXPECT_EQ(handset().efs().File("/f"), data);
    Bytes back(data.size() + 1);
    EXPECT_EQ(ReadMem("/f", back), 1) << LogText();
    EXPECT_EQ(back, data);
  }
  std::vector<size_t> Writes(size_t most) {
    std::vector<size_t> sizes;
    for (const Bytes& request : RequestsOf(5)) sizes.push_back(request.size() - 8);
    sizes.resize(std::min(most, sizes.size()));
    return sizes;
  }
  std::vector<uint32_t> Reads(size_t most) {
    std::vector<uint32_t> sizes;
    for (const Bytes& request : RequestsOf(4)) sizes.push_back(handset::GetU32(request, 4));
    sizes.resize(std::min(most, sizes.size()));
    return sizes;
  }
  const Bytes data_ = RandomBytes(20000);
};

TEST_F(EfsPacketSizes, AreTheLargestThatTheHandsetTakes) {
  const FoundSizes rows[] = {
      {"takes all", handset::Ignore(), When::Nth(1).Of("FF"), {6131, 6131, 6131}, {6131}, {4071, 4071}, {4071}},
      {"ignores writes",
       handset::Ignore(),
       When::Always().LongerThan(2100),
       {6131, 2048, 2048},
       {2048},
       {4071},
       {4071}},
      {"refuses writes",
       handset::Refuse(handset::Refusal::kBadLength),
       When::Always().LongerThan(2000),
       {6131, 2048, 512, 512},
       {512},
       {4071},
       {4071}},
      {"ignores reads",
       handset::Ignore(),
       When::Always().Of("4B 13 04 00 00 00 00 00 E7 0F"),
       {6131},
       {6131},
       {4071, 2048, 2048},
       {2048}},
      // The answer to the packet that was tried comes in front of that to the one in its place.
      {"writes late", handset::Lag(150), When::Nth(1).LongerThan(6000), {6131, 2048, 2048}, {2048}, {4071}, {4071}},
      // Not the size is at fault where such a packet has passed before.
      {"loses one", handset::Lose(), When::Nth(2).LongerThan(6000), {6131, 6131, 6131, 6131}, {6131}, {4071}, {4071}},
  };
  for (const FoundSizes& row : rows) {
    SCOPED_TRACE(row.name);
    ConnectAnew();
    handset().faults().Clear();
    handset().faults().Add(row.fault, row.when);
    PutAndGet(data_);
    EXPECT_EQ(Writes(row.writes.size()), row.writes);
    EXPECT_EQ(Reads(row.reads.size()), row.reads);
    PutAndGet(data_);
    EXPECT_EQ(Writes(1), row.writes_again) << "known now";
    EXPECT_EQ(Reads(1), row.reads_again);
  }
}

TEST_F(EfsPacketSizes, AreTheCallersForShortFilesAndNeverSmaller) {
  PutAndGet(RandomBytes(4000));
  EXPECT_EQ(Writes(1), std::vector<size_t>{512}) << "not worth a try";
  PutAndGet(RandomBytes(5400));
  handset().faults().Add(handset::Ignore(), When::Always().LongerThan(5500));
  PutAndGet(data_);
  EXPECT_EQ(Writes(2), (std::vector<size_t>{6131, 2048})) << "one of 5,412 bytes has shown nothing of larger ones";
  ConnectAnew();
  handset().faults().Clear();
  handset().efs().SetReadLimit(1000);
  PutAndGet(data_);
  EXPECT_EQ(Reads(2), (std::vector<uint32_t>{4071, 4071})) << "it sends what it can";
  EXPECT_EQ(RequestsOf(4).size(), 20u);
  handset().efs().SetReadLimit(SIZE_MAX);
  ConnectAnew();
  KRAL_SetEfsReadAndWritePacketSize(handle(), 536, 1500);
  handset().faults().Add(handset::Ignore(), When::Always().LongerThan(1600));
  PutAndGet(data_);
  EXPECT_EQ(Writes(3), (std::vector<size_t>{6131, 2048, 1488}));
}

TEST_F(EfsTransfer, PacketSizesWithoutRoomFailTheTransfer) {
  const uint8_t byte = 1;
  for (const uint16_t size : {0, 12, 6144, 65535}) {
    KRAL_SetEfsReadAndWritePacketSize(handle(), 536, size);
    EXPECT_EQ(KRAL_EfsWriteMem(handle(), &byte, 1, "/f"), 0) << size;
    EXPECT_FALSE(handset().efs().Exists("/f")) << "nothing is left of it";
  }
  handset().efs().AddFile("/f", Bytes{1});
  handset().efs().AddFile("/large", Bytes(4072));
  const std::pair<uint16_t, const char*> unusable[] = {{0, "/f"}, {20, "/f"}, {4092, "/large"}, {65535, "/large"}};
  for (const auto& [size, path] : unusable) {
    KRAL_SetEfsReadAndWritePacketSize(handle(), size, 524);
    Bytes back(5000);
    EXPECT_EQ(ReadMem(path, back), 0) << size;
  }
  Bytes back(10);
  EXPECT_EQ(ReadMem("/f", back), 1) << "the answer is short enough";
}

TEST_F(EfsTransfer, OldFileStaysWhereTheCallIsBoundToFail) {
  const std::string long_path = "/" + std::string(243, 'p');  // an item's requests take it, the opening one does not
  KRAL_ConfigureEfs2CallBacks(handle(), &NoteProgress, nullptr);
  for (const char* const reason : {"path", "packet size", "abort"}) {
    SCOPED_TRACE(reason);
    const std::string path = reason == std::string("path") ? long_path : "/f";
    handset().efs().AddItemFile(path, Bytes{1, 2});
    KRAL_SetEfsReadAndWritePacketSize(handle(), 536, reason == std::string("packet size") ? 12 : 524);
    // An abort while the handset tells the status.
    handset().OnSubsystem(19, 19, {}, [&](handset::ByteView request, handset::Wire& wire) {
      if (reason == std::string("abort")) KRAL_AbortEFS_Operation(handle());
      wire.Send(ByteWriter().Raw(request.first(4)).Raw(Bytes(12)).U32(512).Raw(Bytes(24, 1)).Take());
    });
    const uint8_t byte = 7;
    EXPECT_EQ(KRAL_EfsWriteMem(handle(), &byte, 1, path.c_str()), 0);
    EXPECT_EQ(handset().efs().File(path), (Bytes{1, 2})) << LogText();
  }
}

TEST_F(EfsTransfer, ItemFilesAreFetchedWithOneRequestAndReplacedByFiles) {
  const Bytes item = RandomBytes(1024);
  handset().efs().AddItemFile("/nv/item", item);
  EXPECT_EQ(KRAL_EfsRead(handle(), folder_.Path("local").c_str(), "/nv/item"), 1);
  EXPECT_EQ(folder_.Content("local"), Text(item));
  EXPECT_EQ(RequestsOf(39), std::vector<Bytes>{ByteWriter().U32(1024).U32(9).U16(1).Terminated("/nv/item").Take()});
  EXPECT_TRUE(RequestsOf(4).empty());
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, " EFS Get Transferred 1024"));

  EXPECT_EQ(KRAL_EfsWriteMem(handle(), item.data(), 10, "/nv/item"), 1);
  EXPECT_EQ(handset().efs().Mode("/nv/item"), 0x8000u | 0666u);
  EXPECT_EQ(RequestsOf(8).size(), 1u);
}

TEST_F(EfsTransfer, ItemFilesTravelBothWays) {
  const std::string local = folder_.Add("item", "content");
  EXPECT_EQ(KRAL_Efs2PutItem(handle(), local.c_str(), "/i"), 1);
  EXPECT_EQ(handset().efs().Mode("/i"), 0xE000u | 0666u);
  EXPECT_EQ(KRAL_Efs2GetItem(handle(), folder_.Path("back").c_str(), "/i", 1024), 1);
  EXPECT_EQ(folder_.Content("back"), "content");
  EXPECT_EQ(KRAL_Efs2GetItem(handle(), folder_.Path("part").c_str(), "/i", 3), 1);
  EXPECT_EQ(folder_.Content("part"), "con");

  EXPECT_EQ(KRAL_Efs2GetItem(handle(), folder_.Path("none").c_str(), "/missing", 10), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "EFS Get item  error code 2"));
  EXPECT_EQ(KRAL_Efs2GetItem(handle(), folder_.Path("none").c_str(), "/i", 1025), 0);
  EXPECT_EQ(folder_.Content("none"), "");
  const std::string nowhere = folder_.Path("no/such/folder");
  EXPECT_EQ(KRAL_Efs2GetItem(handle(), nowhere.c_str(), "/i", 10), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "Failed to write item file data to the local file: '" + nowhere + "'"));
  const std::string large = folder_.Add("large", std::string(1025, 'x'));
  EXPECT_EQ(KRAL_Efs2PutItem(handle(), large.c_str(), "/i"), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR,
                      "KRAL_EFS2_DIAG_Put source file '" + large + "' is too big. Item file max size is 1024 bytes, "));
}

TEST_F(EfsTransfer, ProgressIsReportedAfterEveryChunk) {
  const Bytes data = RandomBytes(1300);
  KRAL_ConfigureEfs2CallBacks(handle(), &NoteProgress, nullptr);
  g_progress.clear();
  g_abort_at = 0;
  KRAL_EfsWriteMem(handle(), data.data(), 1300, "/f");
  EXPECT_EQ(g_progress, (std::vector<std::string>{"5 512/1300", "5 1024/1300", "5 1300/1300"}));
  g_progress.clear();
  Bytes back(1300);
  ReadMem("/f", back);
  EXPECT_EQ(g_progress, (std::vector<std::string>{"4 516/1300", "4 1032/1300", "4 1300/1300"}));
  g_progress.clear();
  handset().efs().AddItemFile("/i", Bytes{1, 2, 3});
  KRAL_Efs2GetItem(handle(), folder_.Path("i").c_str(), "/i", 10);
  EXPECT_EQ(g_progress, std::vector<std::string>{"39 3/10"});
}

TEST_F(EfsTransfer, AbortAtAnyChunkLeavesNoPartialFile) {
  const Bytes data = RandomBytes(2000);
  handset().efs().AddFile("/source", data);
  const std::string local = folder_.Add("local", Text(data));
  const std::string target = folder_.Add("target", "before");
  KRAL_ConfigureEfs2CallBacks(handle(), &NoteProgress, nullptr);
  for (g_abort_at = 1; g_abort_at <= 4; ++g_abort_at) {
    SCOPED_TRACE(g_abort_at);
    g_progress.clear();
    EXPECT_EQ(KRAL_EfsWrite(handle(), local.c_str(), "/f"), 0);
    EXPECT_EQ(g_progress.size(), g_abort_at);
    EXPECT_FALSE(handset().efs().Exists("/f"));
    g_progress.clear();
    EXPECT_EQ(KRAL_EfsRead(handle(), target.c_str(), "/source"), 0);
    EXPECT_EQ(g_progress.size(), g_abort_at);
    EXPECT_EQ(folder_.Content("target"), "before");
    EXPECT_EQ(handset().efs().open_descriptors(), 0u);
  }
  handset().efs().AddItemFile("/item", Bytes{1});
  g_progress.clear();
  g_abort_at = 1;
  EXPECT_EQ(KRAL_EfsRead(handle(), target.c_str(), "/item"), 0);
  EXPECT_EQ(folder_.Content("target"), "before");
  // The flag is forgotten by the next transfer.
  g_abort_at = 0;
  EXPECT_EQ(KRAL_EfsRead(handle(), target.c_str(), "/source"), 1);
  EXPECT_EQ(folder_.Content("target"), Text(data));
}

// --- What the handset cannot or will not do -------------------------------------------------------------------------

TEST_F(EfsTransfer, FailuresOfTheHandsetAreNamed) {
  const Bytes data = RandomBytes(2000);
  const std::string local = folder_.Add("local", Text(data));
  handset().efs().AddFile("/locked", Bytes{1}, 0444);
  handset().efs().AddDirectory("/folder");
  const auto put = [&](const char* path) {
    ClearLog();
    return KRAL_EfsWrite(handle(), local.c_str(), path);
  };
  EXPECT_EQ(put("/locked"), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "EFS2FileOpen() failed to open file /locked"));
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EfsWrite() - FAIL"));
  EXPECT_EQ(RequestsOf(2).size(), 5u) << "an error number is tried again";
  EXPECT_EQ(put("/missing/f"), 0);
  EXPECT_EQ(put("/folder"), 0);
  EXPECT_EQ(handset().efs().File("/locked"), Bytes{1});

  EXPECT_EQ(KRAL_EfsWrite(handle(), folder_.Path("missing").c_str(), "/f"), 0);
  EXPECT_EQ(KRAL_EfsRead(handle(), folder_.Path("x").c_str(), "/missing"), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "EFS Read error code 2"));
  EXPECT_EQ(folder_.Content("x"), "");
  const std::string nowhere = folder_.Path("no/such/folder");
  EXPECT_EQ(KRAL_EfsRead(handle(), nowhere.c_str(), "/locked"), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "fopen() failed to open PC file " + nowhere));
  const std::string huge = folder_.Add("huge", "");
  std::filesystem::resize_file(huge, uint64_t{1} << 32);
  EXPECT_EQ(KRAL_EfsWrite(handle(), huge.c_str(), "/huge"), 0);
  EXPECT_TRUE(
      HasLine(KRAL_LOG_ERR, "PC file " + huge + " has 4294967296 bytes, more than a file of the handset can have"));
}

TEST_F(EfsTransfer, HandsetWithoutDescriptorsRefusesCleanly) {
  handset().efs().AddFile("/f", Bytes{1});
  handset().efs().SetLimits(0, 0);
  Bytes back(10);
  EXPECT_EQ(ReadMem("/f", back), 0);
  uint32_t count = 7;
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/", 255, nullptr, &count), 0);
  EXPECT_EQ(count, 7u);
}

TEST_F(EfsTransfer, FullHandsetIsNotWrittenTo) {
  handset().efs().SetTotalBlocks(2);
  const Bytes data = RandomBytes(1025);
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 1025, "/f"), 0);
  EXPECT_TRUE(
      HasLine(KRAL_LOG_ERR, "Available size on local disk is insufficient.  tot_data_size = 1025,  availSpace=1024"));
  EXPECT_FALSE(handset().efs().Exists("/f"));
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 1024, "/f"), 1);
  handset().Expect("4B 13 13 00 2F 00").Reply("4B 13 13 00 05000000" + std::string(72, '0'));
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 1, "/f"), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "StatFSAvailSpace() returned 5"));
}

TEST_F(EfsTransfer, ShortWritesContinueWhereTheHandsetStopped) {
  const Bytes data = RandomBytes(1000);
  handset().efs().SetWriteLimit(300);
  EXPECT_EQ(KRAL_EfsWrite(handle(), folder_.Add("local", Text(data)).c_str(), "/f"), 1);
  EXPECT_EQ(handset().efs().File("/f"), data);
  EXPECT_EQ(RequestsOf(5).size(), 4u);
  handset().efs().SetWriteLimit(0);
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 1000, "/f"), 0) << "none written and no error number";
  EXPECT_FALSE(handset().efs().Exists("/f"));
  handset().efs().SetWriteLimit(SIZE_MAX);
}

// --- Replies that lie -----------------------------------------------------------------------------------------------

class EfsLies : public EfsTransfer {
 protected:
  // From now on `command` is answered so.
  void SetUp() override {
    EfsTransfer::SetUp();
    ShortenTimeOuts();  // the answer to something else is waited behind
  }
  void Answer(uint16_t command, std::function<Bytes(handset::ByteView request)> answer) {
    handset().OnSubsystem(19, command, {},
                          [answer](handset::ByteView request, handset::Wire& wire) { wire.Send(answer(request)); });
  }
};

TEST_F(EfsLies, RepliesAreCheckedAgainstWhatWasAskedAndReceived) {
  handset().efs().AddFile("/f", Bytes{1, 2, 3, 4});
  handset().efs().AddItemFile("/i", Bytes{1, 2, 3, 4});
  constexpr uint16_t kRead = 4, kWrite = 5, kGetItem = 39;
  const struct {
    const char* name;
    uint16_t command;
    std::string reply;  // to a read of four bytes, a write of a hundred, a request for an item of four
  } kLies[] = {
      {"more than asked", kRead, "4B 13 04 00 00000000 00000000 05020000 00000000" + HexText(Bytes(517))},
      {"more than received", kRead, "4B 13 04 00 00000000 00000000 04000000 00000000 01 02 03"},
      {"negative", kRead, "4B 13 04 00 00000000 00000000 FFFFFFFF 00000000"},
      {"another descriptor", kRead, "4B 13 04 00 01000000 00000000 04000000 00000000 01 02 03 04"},
      {"another offset", kRead, "4B 13 04 00 00000000 04000000 04000000 00000000 01 02 03 04"},
      {"another command", kRead, "4B 13 05 00 00000000 00000000 04000000 00000000 01 02 03 04"},
      {"cut", kRead, "4B 13 04 00 00000000 00000000 04000000 000000"},
      {"fewer than the file has", kRead, "4B 13 04 00 00000000 00000000 03000000 00000000 01 02 03"},
      {"more written than asked", kWrite, "4B 13 05 00 00000000 00000000 65000000 00000000"},
      {"negative write", kWrite, "4B 13 05 00 00000000 00000000 FFFFFFFF 00000000"},
      {"write of another descriptor", kWrite, "4B 13 05 00 07000000 00000000 64000000 00000000"},
      {"write at another offset", kWrite, "4B 13 05 00 00000000 01000000 64000000 00000000"},
      {"cut write", kWrite, "4B 13 05 00 00000000"},
      {"larger item", kGetItem, "4B 13 27 00 05000000 00000000 01 00 01 02 03 04 05"},
      {"item of more than received", kGetItem, "4B 13 27 00 04000000 00000000 01 00 01 02 03"},
      {"negative item", kGetItem, "4B 13 27 00 FFFFFFFF 00000000 01 00 01 02 03 04"},
      {"smaller item", kGetItem, "4B 13 27 00 03000000 00000000 01 00 01 02 03"},
      {"cut item", kGetItem, "4B 13 27 00 00000000 00000000 01"},
  };
  const Bytes data = RandomBytes(100);
  for (const auto& lie : kLies) {
    SCOPED_TRACE(lie.name);
    Answer(lie.command, [reply = FromHex(lie.reply)](ByteView) { return reply; });
    if (lie.command == kWrite) {
      EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 100, "/new"), 0);
      EXPECT_FALSE(handset().efs().Exists("/new"));
      continue;
    }
    const char* const path = lie.command == kRead ? "/f" : "/i";
    Bytes back(1000, 0xEE);
    EXPECT_EQ(ReadMem(path, back), 0);
    EXPECT_EQ(back.size(), 1000u);
    EXPECT_EQ(KRAL_EfsRead(handle(), folder_.Path("local").c_str(), path), 0);
    EXPECT_EQ(folder_.Content("local"), "");
  }
}

TEST_F(EfsLies, EndlessFileStopsAtTheBufferAndOnThePc) {
  handset().efs().AddFile("/f", Bytes{1, 2, 3, 4});
  Answer(4, [](handset::ByteView request) {
    return ByteWriter().Raw(request.first(8)).Raw(request.subspan(12, 4)).U32(4071).U32(0).Raw(Bytes(4071)).Take();
  });
  KRAL_SetEfsReadAndWritePacketSize(handle(), 4091, 524);
  handset().efs().AddFile("/f", Bytes(4071));  // fills a packet
  Bytes back(20000);
  EXPECT_EQ(ReadMem("/f", back), 0);
  handset().KeepTrace(false);
  EXPECT_EQ(KRAL_EfsRead(handle(), folder_.Path("local").c_str(), "/f"), 0);
  EXPECT_NE(LogText().find("EFS Read needs more than the 4071 bytes that the handset told"), std::string::npos);
  EXPECT_EQ(folder_.Content("local"), "");
}

TEST_F(EfsLies, PartThatCannotBeRemovedIsNamed) {
  const Bytes data = RandomBytes(100);
  int unlinks = 0;
  Answer(5, [](handset::ByteView) { return handset::FromHex("4B 13 05 00 00000000 00000000 00000000 1C000000"); });
  Answer(8, [&](handset::ByteView) { return ++unlinks, handset::FromHex("4B 13 08 00 0D000000"); });
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), data.data(), 100, "/f"), 0);
  EXPECT_EQ(unlinks, 5);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "EFS Write leaves a part of /f behind"));
}

}  // namespace
}  // namespace kral
