// PKV files: both record layouts, both writers, the library's own file class, and files that are damaged.
#include "kral/pkv.h"
#include "storage/backup/pkv_jobs.h"
#include "storage/pkv/nv_storage.h"
#include "storage/pkv/pkv_set.h"
#include "storage/pkv/varn_pkv_file.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "tests/support/version_numbers.h"

namespace kral::pkv {
namespace {

PkvNvItem Item(uint16_t id, uint8_t fill, uint16_t index = 0, uint16_t subscription = 0) {
  PkvNvItem item{.id = id, .index = index, .subscription = subscription, .status = 0, .data = {}};
  item.data.fill(fill);
  return item;
}

std::vector<uint16_t> IdsOf(const std::vector<PkvNvItem>& items) {
  std::vector<uint16_t> ids;
  for (const PkvNvItem& item : items) ids.push_back(item.id);
  return ids;
}

std::vector<PkvNvItem> ItemsOf(const CNVItemStream& array) {
  std::vector<PkvNvItem> items;
  array.AppendItems(items);
  return items;
}

// --- The item array -------------------------------------------------------------------------------------------------

TEST(CNVItemStream, FreeSlotsAreReusedFromTheLowestAndItemsAreOverwrittenInPlace) {
  CompoundStorage storage;
  CNVItemStream array;
  array.Open(storage, 0, Access::kReadWrite);
  for (uint16_t id = 1; id <= 3; ++id) EXPECT_EQ(array.Write(Item(id, 0x11)), 136u);
  std::vector<uint8_t>& bytes = storage.FindStream("NV_ITEM_ARRAY")->bytes;
  EXPECT_EQ((std::vector<uint8_t>(bytes.begin() + 272, bytes.begin() + 281)),
            (std::vector<uint8_t>{0x88, 0, 1, 0, 3, 0, 0, 0, 0x11}));

  bytes[136 + 2] = 0;  // the second record's flags
  array.Open(storage, 0, Access::kReadWrite);
  EXPECT_EQ(IdsOf(ItemsOf(array)), (std::vector<uint16_t>{1, 3}));
  array.Write(Item(9, 0x99));
  EXPECT_EQ(bytes.size(), 3u * 136u);
  EXPECT_EQ(bytes[136 + 4], 9);
  array.Write(Item(3, 0x33));
  EXPECT_EQ(bytes.size(), 3u * 136u);
  EXPECT_EQ(bytes[272 + 8], 0x33);

  EXPECT_TRUE(array.Delete(3));
  EXPECT_TRUE(array.Delete(1));
  EXPECT_FALSE(array.Delete(1));
  array.Write(Item(7, 0x77));
  EXPECT_EQ(bytes[4], 7);  // not where 3 was
  PkvNvItem found;
  EXPECT_TRUE(array.Find(7, found));
  EXPECT_EQ(found, Item(7, 0x77));
  EXPECT_FALSE(array.Find(3, found));
}

TEST(CNVItemStream, AShortRecordAtTheEndIsOverwritten) {
  CompoundStorage storage;
  storage.OpenOrAddStream("NV_ITEM_ARRAY").bytes.assign(136 + 50, 0);
  CNVItemStream array;
  array.Open(storage, 0, Access::kReadWrite);
  array.Write(Item(1, 1));
  array.Write(Item(2, 2));
  EXPECT_EQ(storage.FindStream("NV_ITEM_ARRAY")->bytes.size(), 272u);
  array.Open(storage, 0, Access::kRead);
  EXPECT_EQ(IdsOf(ItemsOf(array)), (std::vector<uint16_t>{1, 2}));
}

TEST(CNVItemStream, ReadOnlyAccessCreatesAndWritesNothing) {
  CompoundStorage storage;
  CNVItemStream array;
  array.Open(storage, 2, Access::kRead);
  EXPECT_TRUE(array.is_open());
  EXPECT_TRUE(ItemsOf(array).empty());
  EXPECT_EQ(array.Write(Item(1, 1)), 0u);
  EXPECT_TRUE(storage.streams.empty());
  array.Open(storage, 2, Access::kReadWrite);
  EXPECT_NE(storage.FindStream("NV_ITEM_ARRAY_SIM_2"), nullptr);
}

TEST(CNVStorage, ItemsGoToTheOpenArrayOrToAStreamOfTheirOwn) {
  CompoundStorage storage;
  CNVStorage items(storage, 0, Access::kReadWrite);
  items.OpenItemArray();
  EXPECT_EQ(items.Write(Item(453, 1)), 134u);
  items.CloseItemArray();
  EXPECT_EQ(items.Write(Item(453, 2, 17)), 134u);
  EXPECT_EQ(storage.FindStream("NV_ITEM_ARRAY")->bytes.size(), 136u);
  const CompoundStorage* const numbered = storage.FindStorage("NV_NUMBERED_ITEMS");
  ASSERT_NE(numbered, nullptr);
  const CompoundStream* const stream = numbered->FindStorage("00000453")->FindStream("00000017");
  ASSERT_NE(stream, nullptr);
  ASSERT_EQ(stream->bytes.size(), 134u);
  EXPECT_EQ((std::vector<uint8_t>(stream->bytes.begin(), stream->bytes.begin() + 7)),
            (std::vector<uint8_t>{0xC5, 1, 17, 0, 0x86, 0, 2}));

  CNVStorage reader(storage, 0, Access::kRead);
  EXPECT_EQ(reader.Write(Item(453, 9, 17)), 0u);
  EXPECT_EQ(reader.Write(Item(454, 9)), 0u);
  EXPECT_EQ(stream->bytes[6], 2);
}

TEST(PkvNames, OnlyTheirOwnFormIsTaken) {
  const struct {
    const char* text;
    std::optional<uint16_t> subscription;
  } kRows[] = {{"NV_ITEM_ARRAY", 0},
               {"NV_ITEM_ARRAY_SIM_2", 2},
               {"NV_ITEM_ARRAY_SIM_65535", 65535},
               {"NV_ITEM_ARRAY_SIM_65536", std::nullopt},
               {"NV_ITEM_ARRAY_SIM_0", std::nullopt},
               {"NV_ITEM_ARRAY_SIM_02", std::nullopt},
               {"NV_ITEM_ARRAY_SIM_", std::nullopt},
               {"NV_ITEM_ARRAY2", std::nullopt},
               {"NV_ITEM", std::nullopt}};
  for (const auto& row : kRows) EXPECT_EQ(SubscriptionOfName(row.text, kItemArray), row.subscription) << row.text;
  EXPECT_EQ(NumberOfName("00012345"), 12345u);
  EXPECT_EQ(EntryOfName("FFFFFFFF"), UINT32_MAX);
  EXPECT_EQ(EntryName(0xBEEF), "0000BEEF");
  EXPECT_EQ(RfNvPath(20203), "/nv/item_files/rfnv/00020203");
  for (const char* text : {"1234567", "123456789", "0000000A", "-0000001", ""}) EXPECT_FALSE(NumberOfName(text));
  for (const char* text : {"ffffffff", "0000000G"}) EXPECT_FALSE(EntryOfName(text));
}

// --- Sets, through both writers -------------------------------------------------------------------------------------

void SortItems(PkvSet& set) {
  std::ranges::sort(set.items, [](const auto& a, const auto& b) {
    return std::tuple(a.subscription, a.id, a.index) < std::tuple(b.subscription, b.id, b.index);
  });
}

PkvSet ExampleSet() {
  PkvSet set;
  for (uint16_t id = 0; id < 40; ++id) set.items.push_back(Item(id * 7, static_cast<uint8_t>(id)));
  set.items.push_back(Item(10, 0xA0, 1));
  set.items.push_back(Item(10, 0xA1, 2));
  set.items.push_back(Item(5, 0xB0, 0, 1));
  set.items.push_back(Item(5, 0xB1, 3, 2));
  SortItems(set);
  set.files = {{"/nv/item_files/rfnv/00020203", 0xE1FF, {1, 2, 3}},
               {"/nv/items/empty", 0xE1FF, {}},
               {"nv/reg_files/conf/plain", 0x81FF, std::vector<uint8_t>(5000, 0x5A)}};
  set.properties.values = {{"ESN", "12345678"}, {"Model", "a=b"}};
  return set;
}

class PkvFiles : public testing::Test {
 protected:
  std::string Path(const char* name = "phone.pkv") { return folder_.Path(name); }
  test::TempFolder folder_;
};

TEST_F(PkvFiles, WhatOneWriterWritesTheReaderReads) {
  for (const PkvWriter writer : {PkvWriter::kStorageClasses, PkvWriter::kVarnPkvFile}) {
    SCOPED_TRACE(static_cast<int>(writer));
    const PkvSet set = ExampleSet();
    PkvSet given = set;
    given.items.push_back(Item(60000, 1));
    given.items.back().status = 5;         // has no value
    given.items.push_back(Item(7, 0xFF));  // again: the first one counts
    const PkvOutcome written = WritePkv(Path(), given, nullptr, writer);
    ASSERT_TRUE(written.done()) << written.text;
    PkvSet read;
    const PkvOutcome outcome = ReadPkv(Path(), read);
    ASSERT_TRUE(outcome.done()) << outcome.text;
    EXPECT_EQ(read.items, set.items);
    EXPECT_EQ(read.files, set.files);
    EXPECT_EQ(read.properties.version, "VARN " + test::VersionNumbers());
    EXPECT_EQ(read.properties.values, set.properties.values);
  }
}

// The same set, written by each writer of each platform; the fuzzer begins with these, too.
TEST_F(PkvFiles, FilesOfBothPlatformsHoldTheSame) {
  PkvSet set;
  for (const uint16_t id : {0, 3, 453, 9999}) {
    for (const uint16_t subscription : {0, 1}) {
      set.items.push_back(Item(id, static_cast<uint8_t>(id + subscription), 0, subscription));
    }
  }
  set.items.push_back(Item(453, 0x77, 7));
  SortItems(set);
  set.files = {{"/nv/item_files/rfnv/00020203", 0xE1B6, {1, 2, 3}},
               {"nv/reg_files/conf/plain", 0x81B6, std::vector<uint8_t>(5000, 0x5A)}};
  for (const char* name : {"linux_arrays", "linux_numbered", "windows_arrays", "windows_numbered"}) {
    SCOPED_TRACE(name);
    PkvSet read;
    const PkvOutcome outcome = ReadPkv(std::string(KRAL_CORPUS "/pkv/") + name, read);
    ASSERT_TRUE(outcome.done()) << outcome.text;
    EXPECT_EQ(read.items, set.items);
    EXPECT_EQ(read.files, set.files);
    EXPECT_EQ(read.properties.version, "VARN " + test::VersionNumbers());
  }
}

TEST_F(PkvFiles, DamagedOnesAreToldApart) {
  const auto tree = [&](const std::function<void(CompoundStorage&)>& build) {
    CompoundStorage root;
    build(root);
    EXPECT_EQ(SaveCompoundFile(Path(), root), "");
  };
  const auto bytes_of = [](const auto& record) { return std::vector<uint8_t>(record.begin(), record.end()); };
  const auto numbered = [&](const std::vector<uint8_t>& record) {
    tree([&](auto& root) {
      root.OpenOrAddStorage("NV_NUMBERED_ITEMS").OpenOrAddStorage("00000001").OpenOrAddStream("00000000").bytes =
          record;
    });
  };
  const auto array = [&](const std::vector<uint8_t>& records) {
    tree([&](auto& root) { root.OpenOrAddStream("NV_ITEM_ARRAY").bytes = records; });
  };
  const auto directory = [&](const char* entry, bool with_content) {
    tree([&](auto& root) {
      auto& files = root.OpenOrAddStorage("Default_Phone_Configuration").OpenOrAddStorage("EFS_Backup");
      files.OpenOrAddStorage("EFS_Dir").OpenOrAddStream("00000000").bytes = FromHex(entry);
      if (with_content) files.OpenOrAddStorage("EFS_Data").OpenOrAddStream("00000000");
    });
  };
  auto longer = ArrayRecord(Item(2, 1));
  longer[0] = 0x87;
  const struct {
    const char* what;
    std::function<void()> make;
    PkvResult result;
  } kRows[] = {
      {"not there", [] {}, PkvResult::kCannotOpen},
      {"no compound document", [&] { folder_.Add("phone.pkv", std::string(2000, 'x')); }, PkvResult::kCannotOpen},
      {"of something else", [&] { tree([](auto& root) { root.OpenOrAddStorage("Other"); }); }, PkvResult::kNoStorage},
      {"an empty configuration",
       [&] { tree([](auto& root) { root.OpenOrAddStorage("Default_Phone_Configuration"); }); }, PkvResult::kDone},
      {"a bare configuration", [&] { array(std::vector<uint8_t>(136)); }, PkvResult::kDone},
      {"a short numbered item", [&] { numbered({1}); }, PkvResult::kDamagedItem},
      {"a record of another id than its storage", [&] { numbered(bytes_of(NumberedRecord(Item(2, 1)))); },
       PkvResult::kDamagedItem},
      {"an array record of another length", [&] { array(bytes_of(longer)); }, PkvResult::kDamagedItem},
      {"a file without content", [&] { directory("00000000 03000000 2F 61", false); }, PkvResult::kDamagedItem},
      {"a path with a zero", [&] { directory("00000000 00000000 2F 00 61", true); }, PkvResult::kDamagedItem},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.what);
    row.make();
    PkvSet set;
    set.items.push_back(Item(1, 1));
    const PkvOutcome outcome = ReadPkv(Path(), set);
    EXPECT_EQ(outcome.result, row.result) << outcome.text;
    EXPECT_EQ(outcome.text.empty(), outcome.done());
    EXPECT_TRUE(outcome.done() || set.items.size() == 1);
  }
}

// Others keep the elements of an array as records of one id.
TEST_F(PkvFiles, RecordsOfOneIdWithDifferentIndexesAreItemsOfTheirOwn) {
  CompoundStorage root;
  std::vector<uint8_t>& records = root.OpenOrAddStream("NV_ITEM_ARRAY").bytes;
  for (const PkvNvItem& item : {Item(5, 1), Item(5, 2, 1), Item(5, 9, 2), Item(6, 4), Item(5, 3, 2)}) {
    const auto record = ArrayRecord(item);
    records.insert(records.end(), record.begin(), record.end());
  }
  ASSERT_EQ(SaveCompoundFile(Path(), root), "");
  PkvSet set;
  ASSERT_TRUE(ReadPkv(Path(), set).done());
  EXPECT_EQ(set.items, (std::vector<PkvNvItem>{Item(5, 1), Item(5, 2, 1), Item(5, 3, 2), Item(6, 4)}));

  // What is written takes the place of its own record, and of no other.
  VARN_PkvFile file;
  file.open(Path());
  file << Item(5, 0x11) << Item(5, 0x33, 2);
  file.writeToDisk();
  ASSERT_TRUE(ReadPkv(Path(), set).done());
  EXPECT_EQ(set.items, (std::vector<PkvNvItem>{Item(5, 0x11), Item(5, 2, 1), Item(5, 0x33, 2), Item(6, 4)}));
}

TEST_F(PkvFiles, WhatNoReaderTakesIsTold) {
  PkvSet set;
  set.items = {Item(1, 1), Item(2, 2, 1)};
  set.files = {{"/nv/x", 0x81FF, {1}}};
  ASSERT_TRUE(WritePkv(Path(), set).done());
  CompoundStorage root;
  ASSERT_EQ(LoadCompoundFile(Path(), root), "");
  CompoundStorage& configuration = *root.FindStorage("Default_Phone_Configuration");
  configuration.OpenOrAddStream("NV_ITEM_ARRAY_SIM_0");
  configuration.OpenOrAddStorage("NV_NUMBERED_ITEMS_SIM_70000");
  configuration.OpenOrAddStorage("NV_NUMBERED_ITEMS").OpenOrAddStorage("00065536").OpenOrAddStream("00000000");
  configuration.OpenOrAddStorage("NV_NUMBERED_ITEMS").OpenOrAddStream("00000001");
  configuration.OpenOrAddStorage("EFS_Backup").OpenOrAddStorage("EFS_Data").OpenOrAddStream("00000009");
  configuration.OpenOrAddStorage("EFS_Backup").OpenOrAddStorage("EFS_Dir").OpenOrAddStream("nine");
  configuration.OpenOrAddStorage("Provisioning_Item_Files").OpenOrAddStream("EFS_Dir");
  configuration.OpenOrAddStorage("Provisioning_Item_Files").OpenOrAddStream("EFS_Data");
  configuration.OpenOrAddStream("Feature_Mask");
  configuration.OpenOrAddStream("NV_ITEM_ARRAY").bytes.resize(137);
  ASSERT_EQ(SaveCompoundFile(Path(), root), "");
  PkvSet read;
  const PkvOutcome outcome = ReadPkv(Path(), read);
  ASSERT_TRUE(outcome.done()) << outcome.text;
  EXPECT_EQ(read.items, set.items);
  EXPECT_EQ(read.files, set.files);
  std::ranges::sort(read.unread);
  EXPECT_EQ(read.unread, (std::vector<std::string>{
                             "EFS_Backup/EFS_Data/00000009: a content without an entry",
                             "EFS_Backup/EFS_Dir/nine: no number of a file",
                             "NV_ITEM_ARRAY: a part of a record at its end",
                             "NV_ITEM_ARRAY_SIM_0: no such subscription",
                             "NV_NUMBERED_ITEMS/00000001: a stream, no storage",
                             "NV_NUMBERED_ITEMS/00065536: no item has this number",
                             "NV_NUMBERED_ITEMS_SIM_70000: no such subscription",
                             "Provisioning_Item_Files/EFS_Data: a stream, no storage",
                             "Provisioning_Item_Files/EFS_Dir: a stream, no storage",
                         }));
}

TEST_F(PkvFiles, AFileThatCannotBeWrittenStaysAsItWas) {
  for (const PkvWriter writer : {PkvWriter::kStorageClasses, PkvWriter::kVarnPkvFile}) {
    const PkvOutcome outcome = WritePkv(folder_.Path("no such folder/phone.pkv"), ExampleSet(), nullptr, writer);
    EXPECT_EQ(outcome.result, PkvResult::kCannotWrite);
    EXPECT_FALSE(outcome.text.empty());
  }
  folder_.Add("phone.pkv", "precious");
  EXPECT_EQ(backup::StatusOf(WritePkv(Path(), {}, nullptr, PkvWriter::kVarnPkvFile).result),
            KRAL_PKV_STATUS_NOTHING_READ);
  EXPECT_EQ(folder_.Content("phone.pkv"), "precious");
}

// --- VARN_PkvFile ---------------------------------------------------------------------------------------------------

std::string RaisedBy(const std::function<void()>& action) {
  try {
    action();
  } catch (const VARN_PkvFile::Exception& exception) {
    return exception.what();
  }
  return "nothing raised";
}

TEST_F(PkvFiles, TheIteratorGivesEveryItemOfBothLayouts) {
  PkvSet set;
  set.items = {Item(1, 1), Item(2, 2), Item(2, 3, 1), Item(4, 4, 0, 1)};
  ASSERT_TRUE(WritePkv(Path(), set, nullptr, PkvWriter::kStorageClasses).done());
  VARN_PkvFile file;
  file.open(Path());
  std::vector<PkvNvItem> items(file.begin(), file.end());
  EXPECT_EQ(items, set.items);

  VARN_PkvFile::Iterator i = file.begin();
  const VARN_PkvFile::Iterator first = i++;
  EXPECT_EQ(first->id, 1);
  EXPECT_EQ((*i).id, 2);
  EXPECT_TRUE(i != first);
  EXPECT_TRUE(i == ++file.begin());
  EXPECT_EQ((++i)->index, 1);

  // What is added joins the file; an item that is there already is replaced, wherever it was.
  file << Item(2, 0x22) << Item(2, 0x33, 1) << Item(3, 5);
  file.writeToDisk();
  EXPECT_EQ(std::vector<PkvNvItem>(file.begin(), file.end()), set.items);
  PkvSet joined;
  ASSERT_TRUE(ReadPkv(Path(), joined).done());
  EXPECT_EQ(joined.items,
            (std::vector<PkvNvItem>{Item(1, 1), Item(2, 0x22), Item(2, 0x33, 1), Item(3, 5), Item(4, 4, 0, 1)}));
}

TEST_F(PkvFiles, WhatIsAddedToAFileKeepsItsPropertiesAndReplacesFilesOfItsPaths) {
  PkvSet set = ExampleSet();
  ASSERT_TRUE(WritePkv(Path(), set).done());
  VARN_PkvFile file;
  file.open(Path());
  file << Item(60000, 1);
  set.files[1].bytes = {9, 8};
  set.files[2].bytes = {7};
  set.files[1].mode = 0x81A4;  // now no item file
  for (size_t i : {1, 2}) file << set.files[i];
  file.writeToDisk();
  PkvSet joined;
  ASSERT_TRUE(ReadPkv(Path(), joined).done());
  std::swap(set.files[1], set.files[2]);  // it went behind those of its kind
  EXPECT_EQ(joined.files, set.files);
  EXPECT_EQ(joined.properties.values, set.properties.values);
}

TEST_F(PkvFiles, WhatTheReaderWouldRefuseForItsSizeIsNotWritten) {
  folder_.Add("phone.pkv", "precious");
  CompoundStorage root;
  auto& storage = root.OpenOrAddStorage("many");
  for (size_t i = 0; i < kCompoundEntryLimit; ++i) storage.streams.push_back({std::to_string(i), {}});
  EXPECT_NE(SaveCompoundFile(Path(), root), "");
  EXPECT_EQ(folder_.Content("phone.pkv"), "precious");
}

TEST_F(PkvFiles, EveryMisuseRaisesItsText) {
  VARN_PkvFile none;
  VARN_PkvFile::Iterator unset;
  // Files of the same item, and maybe of a file, that may grow to so many bytes.
  std::deque<VARN_PkvFile> made;
  const auto limited = [&](size_t limit, bool with_file = false) {
    return [&, limit, with_file] {
      VARN_PkvFile& file = made.emplace_back(Path());
      file << Item(453, 1);
      if (with_file) file << PkvEfsFile{"/nv/items/x", 0xE1FF, {1}};
      file.set_size_limit(limit);
      file.writeToDisk();
    };
  };
  VARN_PkvFile files_only(Path());
  files_only << PkvEfsFile{"/nv/items/x", 0xE1FF, {1}};
  const std::string iterator = "VARN_PkvFile::Iterator::";
  const std::string unset_end = " - The iterator is not initialized.";
  const std::string impl = "VARN_PkvFile::writeToDiskImpl() - Tried to write ";
  const struct {
    std::function<void()> action;
    std::string text;
  } kRows[] = {
      {[&] { none.writeToDisk(); },
       "VARN_PkvFile::writeToDisk() - Before calling this member function you need to add at least 1 NV item to the "
       "this object using the insertion operator."},
      {[&] { files_only.writeToDisk(); },
       "VARN_PkvFile::writeToDisk() - Before calling this member function you need to add at least 1 NV item to the "
       "this object using the insertion operator."},
      {limited(134 + 19, true), impl + "EFS File: '/nv/items/x' but was only able to write 19 out of 20 bytes"},
      {[&] { none.begin(); },
       "VARN_PkvFile::begin() - Error no PKV file has been opened.  Either create the PKV with a file name, or call "
       "the open member function with a file name as a parameter."},
      {[&] { (void)*unset; }, iterator + "operator*()" + unset_end},
      {[&] { (void)unset->id; }, iterator + "operator->()" + unset_end},
      {[&] { ++unset; }, iterator + "operator++()" + unset_end},
      {[&] { unset++; }, iterator + "operator++( int )" + unset_end},
      {[&] { (void)(unset == unset); }, iterator + "operator==( const VARN_PkvFile::Iterator& rhs )" + unset_end},
      {[&] { (void)(unset != unset); }, iterator + "operator!=( const VARN_PkvFile::Iterator& rhs )" + unset_end},
      {limited(133), impl + "NV Item: '453' but was only able to write 133 out of 134 bytes"},
      {limited(134 + 5), impl + "the Mobile_Property_Info but was only able to write 5 out of 12 bytes"},
      {limited(134 + 12 + 3), impl + "the File_Version Stream but was only able to write 3 out of 8 bytes"},
  };
  for (const auto& row : kRows) EXPECT_EQ(RaisedBy(row.action), row.text);
  EXPECT_EQ(folder_.Content("phone.pkv"), "");

  CompoundStorage root;
  root.OpenOrAddStorage("NV_NUMBERED_ITEMS").OpenOrAddStorage("00000007").OpenOrAddStream("00000000").bytes = {7, 0};
  ASSERT_EQ(SaveCompoundFile(Path(), root), "");
  VARN_PkvFile damaged(Path());
  EXPECT_EQ(
      RaisedBy([&] { damaged.begin(); }),
      "VARN_PkvFile::IteratorImpl::increamentImpl() - Tried to read NV Item: 7. Was only able to read 2 out of 134");
}

}  // namespace
}  // namespace kral::pkv
