// Which files of a handset a backup holds, and how they come back: kinds, sizes, permissions, hostile listings.
#include "tests/support/pkv_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;
using PkvFileKinds = test::PkvTest;
using test::kRfFile;
using test::Result;

TEST_F(PkvFileKinds, HostileListingsAndFilesAreLeftOut) {
  handset().efs().AddItemFile("/nv/items/good", Bytes{1});
  for (int i = 0; i < 300; ++i) handset().efs().AddLink("/nv/items/" + std::to_string(i), "good");  // listed twice
  handset().efs().AddFile("/nv/items/huge", Bytes((1 << 20) + 1));
  std::string deep = "/nv/items";
  for (int i = 0; i < 12; ++i) deep += "/d";
  handset().efs().AddFile(deep + "/deep", Bytes{1});
  handset().efs().AddLink("/nv/items/loop", "/nv/items");
  handset().efs().AddDirectory("/nv/items/self");
  handset().efs().AddDirectory("/nv/items/above");
  handset().efs().ShowNameAs("self", ".");
  handset().efs().ShowNameAs("above", "..");
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_INCOMPLETE) << ErrorText();
  EXPECT_EQ(g_results["/nv/items/huge"], Result(KRAL_PKV_REFUSED, 0xFFFF));
  ASSERT_EQ(Read().files.size(), 1u);
  EXPECT_EQ(Read().files[0].path, "/nv/items/good");
}

TEST_F(PkvFileKinds, ItemFilesBeyondARequestAreReadWhereTheHandsetOpensThem) {
  const std::string large = "/nv/item_files/rfnv/00020204";
  handset().efs().AddItemFile(large, RandomBytes(2000));
  handset().efs().OpenItemFiles(true);
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
  ASSERT_EQ(Read().files.size(), 1u);
  EXPECT_EQ(Read().files[0].bytes, RandomBytes(2000));
  EXPECT_EQ(Run(KRAL_PKV_Verify), 0u) << ErrorText();
}

// This handset opens no item file as a plain one, so that one beyond an item request cannot be had whole.
TEST_F(PkvFileKinds, FilesThatCannotBeHadWholeAreRefused) {
  const std::string large = "/nv/item_files/rfnv/00020204";
  const std::string far = "/nv/items/" + std::string(200, 'f') + "/" + std::string(40, 'p');
  handset().efs().AddItemFile(large, RandomBytes(2000));
  handset().efs().AddItemFile("/nv/items/full", RandomBytes(1024));
  handset().efs().AddFile(far, Bytes{1});
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_INCOMPLETE) << ErrorText();
  EXPECT_EQ(g_results[large], Result(KRAL_PKV_REFUSED, 0xFFFF));
  EXPECT_EQ(g_results[far], Result(KRAL_PKV_REFUSED, 0xFFFF));
  pkv::PkvSet set = Read();
  ASSERT_EQ(set.files.size(), 1u);
  EXPECT_EQ(set.files[0].bytes, RandomBytes(1024));
  set.files.push_back({large, 0xE1FF, RandomBytes(1024)});  // as if it were whole
  set.files.push_back({far, 0x81FF, {1}});
  set.files.push_back({"/nv/items/last", 0xE1FF, {1}});
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("phone.pkv"), set).done());
  EXPECT_EQ(Run(KRAL_PKV_Verify), KRAL_PKV_STATUS_DIFFERENT);
  EXPECT_EQ(g_results[large].first, KRAL_PKV_REFUSED);
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results[far], Result(KRAL_PKV_REFUSED, 0xFFFF));
  EXPECT_EQ(g_results["/nv/items/last"], Result(KRAL_PKV_DONE, 0));
}

TEST_F(PkvFileKinds, PermissionsComeBackAndARefusalOfThemIsTold) {
  const std::string with_none = "/nv/items/none";
  pkv::PkvSet set;
  set.files = {{kRfFile, 0xE124, {1, 2}}, {with_none, 0x8000, {3}}};
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("phone.pkv"), set).done());
  Run(KRAL_RestoreNVFromPKV);
  EXPECT_EQ(g_results[kRfFile], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(handset().efs().Mode(kRfFile), 0xE124u);
  EXPECT_EQ(g_results[with_none], Result(KRAL_PKV_DONE, 0)) << ErrorText();
  EXPECT_EQ(handset().efs().Mode(with_none), 0x8000u);

  Remove(kRfFile);
  handset().faults().Add(handset::Refuse(20), When::Always().Of("4B 13 12 00"));
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results[kRfFile], Result(KRAL_PKV_DIFFERENT, 0)) << "content alike, permissions not";
  EXPECT_EQ(Run(KRAL_PKV_Verify), KRAL_PKV_STATUS_DIFFERENT);
  EXPECT_EQ(g_results[kRfFile], Result(KRAL_PKV_DIFFERENT, 0));
}

TEST_F(PkvFileKinds, AReadOnlyFileIsSkippedWhenItIsEqual) {
  const std::string plain = "/nv/items/plain";
  handset().efs().AddFile(plain, RandomBytes(600), 0444);
  handset().efs().AddItemFile(kRfFile, RandomBytes(30));
  ASSERT_EQ(KRAL_EFS2_DIAG_CHMOD(handle(), kRfFile, 0444, nullptr), 1);
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(g_results[kRfFile], Result(KRAL_PKV_SKIPPED, 13));
  EXPECT_EQ(g_results[plain].first, KRAL_PKV_SKIPPED);
  handset().efs().AddFile(plain, RandomBytes(600, 2), 0444);
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results[plain].first, KRAL_PKV_REFUSED);
}

// "nv/x" beside "/nv/x", as other programs and older versions of this one wrote them.
TEST_F(PkvFileKinds, AFileThatIsThereTwiceIsRestoredOnce) {
  CompoundStorage root;
  CompoundStorage& files = root.OpenOrAddStorage("Default_Phone_Configuration").OpenOrAddStorage("EFS_Backup");
  int number = 0;
  for (const std::string path : {"/nv/items/x", "nv/items/x"}) {
    const std::string name = "0000000" + std::to_string(number++);
    Bytes entry = handset::FromHex("B6 81 00 00 01 00 00 00");
    entry.insert(entry.end(), path.begin(), path.end());
    files.OpenOrAddStorage("EFS_Dir").OpenOrAddStream(name).bytes = entry;
    files.OpenOrAddStorage("EFS_Data").OpenOrAddStream(name).bytes = {static_cast<uint8_t>(number)};
  }
  ASSERT_EQ(SaveCompoundFile(folder_.Path("phone.pkv"), root), "");
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(Counts(), "1 1 0 0 0 0") << "the second one counts as skipped";
  EXPECT_NE(ErrorText().find("nv/items/x: a second content; passed over"), std::string::npos) << ErrorText();
  EXPECT_EQ(handset().efs().File("/nv/items/x"), Bytes{1});
  EXPECT_EQ(Run(KRAL_PKV_Verify), 0u);
}

TEST_F(PkvFileKinds, APlainFileIsAskedForItsSizeOnce) {
  const std::string path = "/nv/items/plain";
  handset().efs().AddFile(path, RandomBytes(600));
  Bytes request = {75, 19, 15, 0};
  request.insert(request.end(), path.begin(), path.end());
  for (const Job job : {KRAL_BackupNVFromMobileToPKV, KRAL_PKV_Verify}) {
    handset().ClearTrace();
    ASSERT_EQ(Run(job), 0u) << ErrorText();
    EXPECT_EQ(RequestsOf(request), 1u);
  }
}

// Only what is not there has no files.
TEST_F(PkvFileKinds, FoldersThatCannotBeListedAreTold) {
  Furnish();
  const struct {
    const char* name;
    Fault fault;
    When when;
    std::string counts;
    uint32_t status;
  } kRows[] = {
      {"no file system", handset::Refuse(19), When::Always().Of("4B 13"), "20 40 0 0 0 0", 0},
      {"stat refused", handset::Refuse(20), When::Nth(1).Of("4B 13 0F 00"), "22 40 1 0 0 0", 12},
      {"opendir refused", handset::Refuse(24), When::Always().Of("4B 13 0B 00"), "20 40 3 0 0 0", 12},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.name);
    handset().faults().Add(row.fault, row.when);
    EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), row.status) << ErrorText();
    EXPECT_EQ(Counts(), row.counts);
    EXPECT_EQ(g_results.contains("/nv/items"), std::string_view(row.name) != "no file system");
    handset().faults().Clear();
  }
}

}  // namespace
}  // namespace kral
