// Every EFS2 request byte by byte, what its reply becomes, and what is refused before it is sent.
#include "tests/support/efs_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using Call = std::function<uint8_t(KRAL_HANDLE, uint32_t* error_number)>;

class EfsWire : public test::EfsTest {};

// --- One request, one reply -----------------------------------------------------------------------------------------

struct SingleRequest {
  const char* name;
  Call call;
  const char* request;
  const char* reply;  // its error number is 13
};

const SingleRequest kSingleRequests[] = {
    {"KRAL_EfsCreateLink", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EfsCreateLink(h, "/a", "/bc", e); },
     "4B 13 06 00 2F 61 00 2F 62 63 00", "4B 13 06 00 0D 00 00 00"},
    {"KRAL_EfsReadLink", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EfsReadLink(h, "/bc", e, nullptr, 0); },
     "4B 13 07 00 2F 62 63 00", "4B 13 07 00 0D 00 00 00 00"},
    {"KRAL_EfsDelete", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EfsDelete(h, "/a", e); }, "4B 13 08 00 2F 61 00",
     "4B 13 08 00 0D 00 00 00"},
    {"KRAL_EfsRmDir", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EfsRmDir(h, "/a", e); }, "4B 13 0A 00 2F 61 00",
     "4B 13 0A 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_RENAME", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_RENAME(h, "/a", "/b", e); },
     "4B 13 0E 00 2F 61 00 2F 62 00", "4B 13 0E 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_STAT",
     [](KRAL_HANDLE h, uint32_t* e) {
       return KRAL_EFS2_DIAG_STAT(h, "/a", e, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr);
     },
     "4B 13 0F 00 2F 61 00", "4B 13 0F 00 0D 00 00 00 00000000 00000000 00000000 00000000 00000000 00000000"},
    {"KRAL_EFS2_DIAG_CHMOD", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_CHMOD(h, "/a", 0644, e); },
     "4B 13 12 00 A4 01 2F 61 00", "4B 13 12 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_STATFS", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_STATFS(h, "/", e, nullptr); },
     "4B 13 13 00 2F 00",
     "4B 13 13 00 0D 00 00 00 00000000 00000000 00000000 00000000 00000000 00000000 00000000 00000000 00000000"},
    {"KRAL_EFS2_DIAG_ACCESS", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_ACCESS(h, "/a", 4, e); },
     "4B 13 14 00 04 00 2F 61 00", "4B 13 14 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_DEV_INFO", [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_DEV_INFO(h, e, nullptr); },
     "4B 13 15 00", "4B 13 15 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_EXTENDED_INFO",
     [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_EXTENDED_INFO(h, 0x102, e, nullptr, nullptr, nullptr, 0); },
     "4B 13 1D 00 02 01 00 00", "4B 13 1D 00 0D 00 00 00"},
    {"KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY",
     [](KRAL_HANDLE h, uint32_t* e) { return KRAL_EFS2_DIAG_MAKE_GOLDEN_COPY(h, "/", e); }, "4B 13 35 00 2F 00",
     "4B 13 35 00 0D 00 00 00"},
};

TEST_F(EfsWire, SingleRequestsHandOutTheErrorNumber) {
  for (const SingleRequest& row : kSingleRequests) {
    SCOPED_TRACE(row.name);
    handset().Expect(row.request).Reply(row.reply);
    uint32_t error_number = 0;
    ShortenTimeOuts(4000);
    EXPECT_EQ(row.call(handle(), &error_number), 1) << LogText();
    EXPECT_EQ(error_number, 13u);
    EXPECT_TRUE(HasLine(KRAL_LOG_C_HIGH_LEVEL_START, row.name));

    handset().Expect(row.request).Refuse(handset::Refusal::kBadCommand);
    handset().Expect(row.request).Reply(std::string(row.reply, std::size("4B 13 00 00 0D 00 00") - 1));
    handset().Expect(row.request).Reply("4B 13 63 00 00 00 00 00 00 00 00 00 00 00 00 00");
    for (const char* bad : {"refused", "cut", "another's"}) {
      ShortenTimeOuts(bad == std::string_view("another's") ? 20 : 4000);  // the right one is waited for behind it
      error_number = 99;
      EXPECT_EQ(row.call(handle(), &error_number), 0) << bad;
      EXPECT_EQ(error_number, 99u) << bad;
    }
  }
  EXPECT_EQ(handset().requests().size(), 4 * std::size(kSingleRequests));
}

TEST_F(EfsWire, StatReadsItsFields) {
  handset()
      .Expect("4B 13 0F 00 2F 61 00")
      .Reply("4B 13 0F 00 00000000 A4E10000 05000000 02000000 11000000 12000000 13000000");
  uint32_t error = 9, mode = 0, size = 0, links = 0, accessed = 0, modified = 0, changed = 0;
  EXPECT_EQ(KRAL_EFS2_DIAG_STAT(handle(), "/a", &error, &mode, &size, &links, &accessed, &modified, &changed), 1);
  EXPECT_EQ((std::vector{error, mode, size, links, accessed, modified, changed}),
            (std::vector<uint32_t>{0, 0xE1A4, 5, 2, 0x11, 0x12, 0x13}));
  EXPECT_TRUE(HasLine(KRAL_LOG_RET,
                      "KRAL_EFS2_DIAG_STAT(                               sFilePath = /a, iErrorNo = 0x0, iMode = "
                      "0xE1A4, iSize = 0x5,                               iNlink = 0x2, iAtime = 0x11, iMtime = 0x12, "
                      "iCtime  = 0x13)"))
      << LogText();
}

TEST_F(EfsWire, FileSystemStatusReadsItsFields) {
  const char* const reply =
      "4B 13 13 00 00000000 01000000 02000000 00020000 00010000 80000000 40000000 FFFFFF7F 03000000 09000000";
  handset().Expect("4B 13 13 00 2F 00").Reply(reply);
  handset().Expect("4B 13 13 00 2F 6E 00").Reply(reply);
  handset().Expect("4B 13 13 00 2F 78 00").Reply("4B 13 13 00 02000000" + std::string(72, '0'));
  uint32_t error = 9;
  KRAL_EFS_STATFS status{};
  EXPECT_EQ(KRAL_EFS2_DIAG_STATFS(handle(), "/", &error, &status), 1);
  EXPECT_EQ(error, 0u);
  EXPECT_EQ(status.file_system_id, 1u);
  EXPECT_EQ(status.type, 2u);
  EXPECT_EQ(status.block_size, 512u);
  EXPECT_EQ(status.total_blocks, 256u);
  EXPECT_EQ(status.available_blocks, 128u);
  EXPECT_EQ(status.free_blocks, 64u);
  EXPECT_EQ(status.max_file_size, 0x7FFFFFFFu);
  EXPECT_EQ(status.file_count, 3u);
  EXPECT_EQ(status.max_file_count, 9u);

  uint64_t used = 0;
  EXPECT_EQ(KRAL_EFS2_GetGroupInfo(handle(), "/n", &used), 1);
  EXPECT_EQ(used, (256u - 64u) * 512u);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "Space used is: 98304 bytes"));
  EXPECT_EQ(KRAL_EFS2_GetGroupInfo(handle(), "/x", &used), 0);
  EXPECT_EQ(used, 98304u);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "EFS Command Returned Error Number: 2, Verify file/directory exists"));
}

TEST_F(EfsWire, DeviceInfoReadsItsFields) {
  const std::string fields = "4B 13 15 00 00000000 00040000 40000000 00080000 40080000 EC000000 BC000000 01000000 ";
  handset().Expect("4B 13 15 00").Reply(fields + "4E 31 00");
  handset().Expect("4B 13 15 00").Reply(fields + "4E 31");
  uint32_t error = 9;
  KRAL_EFS_DEVICE_INFO info{};
  EXPECT_EQ(KRAL_EFS2_DIAG_DEV_INFO(handle(), &error, &info), 1);
  EXPECT_EQ((std::vector{error, info.total_blocks, info.pages_per_block, info.page_size, info.total_page_size,
                         info.maker_id, info.device_id, info.device_type}),
            (std::vector<uint32_t>{0, 1024, 64, 2048, 2112, 0xEC, 0xBC, 1}));
  EXPECT_STREQ(info.name, "N1");
  EXPECT_EQ(KRAL_EFS2_DIAG_DEV_INFO(handle(), &error, &info), 0) << "a name without end";
}

TEST_F(EfsWire, ExtendedInfoIsANumberOrAText) {
  const char* const request = "4B 13 1D 00 05 00 00 00";
  uint32_t error = 9, type = 9, number = 9;
  char text[4] = "";
  const auto ask = [&](uint32_t room) {
    return KRAL_EFS2_DIAG_EXTENDED_INFO(handle(), 5, &error, &type, &number, text, room);
  };
  handset().Expect(request).Reply("4B 13 1D 00 00000000 00000000 07000000");
  EXPECT_EQ(ask(4), 1);
  EXPECT_EQ((std::vector{error, type, number}), (std::vector<uint32_t>{0, 0, 7}));
  handset().Expect(request).Reply("4B 13 1D 00 00000000 01000000 41 42 43 00");
  EXPECT_EQ(ask(4), 1);
  EXPECT_EQ(type, 1u);
  EXPECT_STREQ(text, "ABC");

  handset().Expect(request).Reply("4B 13 1D 00 00000000 01000000 41 42 43 00");
  handset().Expect(request).Reply("4B 13 1D 00 00000000 01000000 41 42 43");
  handset().Expect(request).Reply("4B 13 1D 00 00000000 02000000 07000000");
  EXPECT_EQ(ask(3), 0) << "no room for the zero";
  EXPECT_EQ(ask(4), 0) << "a text without end";
  EXPECT_EQ(ask(4), 0) << "an unknown type";
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EFS2_DIAG_EXTENDED_INFO( ) -- Error: invalid data return type"));
  EXPECT_STREQ(text, "ABC");
}

TEST_F(EfsWire, LinkTargetsNeedTheirRoom) {
  const char* const reply = "4B 13 07 00 00000000 2F 61 62 00";
  for (int i = 0; i < 2; ++i) handset().Expect("4B 13 07 00 2F 6C 00").Reply(reply);
  handset().Expect("4B 13 07 00 2F 6C 00").Reply("4B 13 07 00 00000000 2F 61 62");
  char target[4] = "?";
  EXPECT_EQ(KRAL_EfsReadLink(handle(), "/l", nullptr, target, 3), 0);
  EXPECT_STREQ(target, "?");
  EXPECT_EQ(KRAL_EfsReadLink(handle(), "/l", nullptr, target, 4), 1);
  EXPECT_STREQ(target, "/ab");
  EXPECT_EQ(KRAL_EfsReadLink(handle(), "/l", nullptr, target, 4), 0) << "a text without end";
}

TEST_F(EfsWire, ExistingDirectoryCountsAsMade) {
  const char* const request = "4B 13 09 00 FF 01 2F 64 00";
  const struct {
    const char* reply;
    uint8_t result;
    uint32_t flag;
    const char* line;
  } kCases[] = {
      {"4B 13 09 00 00000000", 1, KRAL_LOG_RET, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = 0"},
      {"4B 13 09 00 06000000", 1, KRAL_LOG_RET,
       "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = 6 : Directory already exists"},
      {"4B 13 09 00 02000000", 0, KRAL_LOG_ERR, "KRAL_EFS2_DIAG_MKDIR() - Results mkdir_rsp.errnum = 2"},
  };
  for (const auto& c : kCases) {
    handset().Expect(request).Reply(c.reply);
    EXPECT_EQ(KRAL_EfsMkDir(handle(), "/d", nullptr), c.result);
    EXPECT_TRUE(HasLine(c.flag, c.line)) << LogText();
  }
}

// --- Item files -----------------------------------------------------------------------------------------------------

TEST_F(EfsWire, ItemIsPutWithItsFlagsAndSequence) {
  const uint8_t data[] = {0xAA, 0xBB};
  const char* const request = "4B 13 26 00 02000000 40000800 01 00 AA BB 2F 69 00";
  handset().Expect(request).Reply("4B 13 26 00 01 00 00000000");
  handset().Expect(request).Reply("4B 13 26 00 01 00 1C000000");
  EXPECT_EQ(KRAL_EfsPutItemFromMem(handle(), "/i", data, 2), 1);
  EXPECT_EQ(KRAL_EfsPutItemFromMem(handle(), "/i", data, 2), 0);
}

TEST_F(EfsWire, ItemsOfUpTo1024BytesAreSent) {
  const handset::Bytes data = RandomBytes(KRAL_EFS_ITEM_SIZE + 1);
  EXPECT_EQ(KRAL_EfsPutItemFromMem(handle(), "/i", data.data(), 1025), 0);
  EXPECT_EQ(handset().request_count(), 0u);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EFS2_DIAG_Put buffer size is too big. Item file max size is 1024 bytes, "));
  EXPECT_EQ(KRAL_EfsPutItemFromMem(handle(), "/i", data.data(), 1024), 1);
  EXPECT_EQ(handset().efs().File("/i"), handset::Bytes(data.begin(), data.end() - 1));
}

// --- Limits ---------------------------------------------------------------------------------------------------------

TEST_F(EfsWire, PathsOverTheLimitAreNotSent) {
  handset().efs().AddFile("/f", {});
  const auto path = [](size_t size) { return "/" + std::string(size - 1, 'p'); };
  struct Limit {
    const char* name;
    size_t longest;
    std::function<void(const std::string& path)> call;
  };
  uint32_t count = 0;
  const Limit kLimits[] = {
      {"delete", 251, [&](auto& p) { KRAL_EfsDelete(handle(), p.c_str(), nullptr); }},
      {"mkdir", 249, [&](auto& p) { KRAL_EfsMkDir(handle(), p.c_str(), nullptr); }},
      {"opendir", 251, [&](auto& p) { KRAL_EfsDirectory(handle(), p.c_str(), 255, nullptr, &count); }},
      {"rename", 248, [&](auto& p) { KRAL_EFS2_DIAG_RENAME(handle(), p.c_str(), "/a", nullptr); }},
      {"put item", 1024, [&](auto& p) { KRAL_EfsPutItemFromMem(handle(), p.c_str(), nullptr, 0); }},
  };
  for (const Limit& limit : kLimits) {
    SCOPED_TRACE(limit.name);
    uint64_t before = handset().request_count();
    for (const size_t over : {limit.longest + 1, size_t{2000}, size_t{10000}}) limit.call(path(over));
    EXPECT_EQ(handset().request_count(), before);
    limit.call(path(limit.longest));
    EXPECT_GT(handset().request_count(), before);
  }

  // A transfer asks for nothing when it could not open.
  handset().ClearTrace();
  const std::string longest = path(243);
  const uint8_t byte = 1;
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), &byte, 1, longest.c_str()), 1);
  handset().ClearTrace();
  EXPECT_EQ(KRAL_EfsWriteMem(handle(), &byte, 1, (longest + "p").c_str()), 0);
  EXPECT_EQ(handset().requests().size(), 0u);
}

// --- Synchronisation ------------------------------------------------------------------------------------------------

TEST_F(EfsWire, SyncIsPolledUntilDone) {
  handset().Expect("4B 13 30 00 2F 00").Reply("4B 13 30 00 00000000 01000000");
  handset().Expect("4B 13 31 00 2F 00").Reply("4B 13 31 00 00000000 01000000");
  handset().Expect("4B 13 31 00 2F 00").Reply("4B 13 31 00 00000000 00000000");
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 5000), 1);
  EXPECT_NE(LogText().find("4 KRAL_EFS2_SyncWithWait::sync is complete is received at "), std::string::npos);

  handset().Expect("4B 13 30 00 2F 00").Reply("4B 13 30 00 00000000 00000000");
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 0), 1);
  EXPECT_NE(LogText().find("4 KRAL_EFS2_SyncWithWait::already in sync message is received at "), std::string::npos);
}

TEST_F(EfsWire, SyncFailuresAreNamed) {
  handset().Expect("4B 13 30 00 2F 00").Refuse(handset::Refusal::kBadCommand);
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 500), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EFS2_SyncWithWait::_EFS2_DIAG_SYNC_NO_WAIT is not supported by target"));

  handset().Expect("4B 13 30 00 2F 00").Reply("4B 13 30 00 00000000 01000000");
  handset().Expect("4B 13 31 00 2F 00").Refuse(handset::Refusal::kBadCommand);
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 500), 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EFS2_SyncWithWait::_EFS2_DIAG_GET_SYNC_STATUS is not supported by target"));

  handset().Expect("4B 13 30 00 2F 00").Reply("4B 13 30 00 02000000 01000000");
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 500), 0);
  EXPECT_TRUE(
      HasLine(KRAL_LOG_ERR, "KRAL_EFS2_SyncWithWait received ERRNO 2 when sending _EFS2_DIAG_SYNC_NO_WAIT command"));

  handset().Expect("4B 13 30 00 2F 00").Reply("4B 13 30 00 00000000");
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 500), 0) << "no state in the reply";

  handset().efs().SetSyncPolls(2);
  ShortenTimeOuts();
  handset().faults().Add(handset::Lose(), handset::When::Nth(1).Of("4B 13 31"));
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 5000), 1) << "a poll that got lost does not end the wait";
  handset().efs().SetSyncPolls(1000);
  EXPECT_EQ(KRAL_EFS2_SyncWithWait(handle(), "/", 10), 0) << "never done";
}

}  // namespace
}  // namespace kral
