// PKV files against two foreign readers of compound documents, gsf and olefile: every storage and every byte.
#include <cstdlib>

#include "storage/pkv/pkv_set.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::pkv {
namespace {

// Prints "path hex" for every stream.
constexpr const char* kDump =
    "import olefile, sys\n"
    "ole = olefile.OleFileIO(sys.argv[1], raise_defects=olefile.DEFECT_POTENTIAL)\n"
    "for path in sorted(ole.listdir()):\n"
    "    print('/'.join(path), ole.openstream(path).read().hex())\n";

void Dump(const CompoundStorage& storage, const std::string& path, std::map<std::string, std::string>& streams) {
  for (const CompoundStream& stream : storage.streams) {
    std::string& hex = streams[path + stream.name];
    for (const uint8_t byte : stream.bytes) {
      for (const int digit : {byte >> 4, byte & 15}) hex += "0123456789abcdef"[digit];
    }
  }
  for (const CompoundStorage& child : storage.storages) Dump(child, path + child.name + "/", streams);
}

class PkvOracle : public testing::TestWithParam<PkvWriter> {
 protected:
  void SetUp() override {
    // Streams on both sides of the 4,096 bytes below which they share sectors, and more entries than a sector holds.
    PkvSet set;
    for (uint16_t id = 0; id < 200; ++id) {
      for (uint16_t subscription = 0; subscription < 2; ++subscription) {
        PkvNvItem item{.id = id, .subscription = subscription};
        item.data.fill(static_cast<uint8_t>(id + subscription));
        set.items.push_back(item);
      }
      set.items.push_back({.id = id, .index = 3, .data = {7}});
    }
    for (const size_t size : {0, 1, 4095, 4096, 100000}) {
      set.files.push_back({"/nv/items/" + std::to_string(size), 0xE1B6, std::vector<uint8_t>(size, 0x5A)});
    }
    const PkvOutcome outcome = WritePkv(path_, set, nullptr, GetParam());
    ASSERT_TRUE(outcome.done()) << outcome.text;
    CompoundStorage root;
    ASSERT_EQ(LoadCompoundFile(path_, root), "");
    Dump(root, "", expected_);
    ASSERT_GT(expected_.size(), 200u);
  }

  std::string Output(const std::string& command) {
    EXPECT_EQ(std::system((command + " >" + folder_.Path("output") + " 2>" + folder_.Path("errors")).c_str()), 0)
        << command << "\n"
        << folder_.Content("errors") << "the scripts install libgsf-bin and python3-olefile";
    return folder_.Content("output");
  }

  const test::TempFolder folder_;
  const std::string path_ = folder_.Path("phone.pkv");
  std::map<std::string, std::string> expected_;
};

TEST_P(PkvOracle, OlefileReadsEveryByteAndFindsNoDefect) {
  folder_.Add("dump.py", kDump);
  std::string expected;
  for (const auto& [path, hex] : expected_) expected += path + " " + hex + "\n";
  // The system's own Python: olefile comes as its package.
  EXPECT_TRUE(Output("/usr/bin/python3 " + folder_.Path("dump.py") + " " + path_) == expected);
}

TEST_P(PkvOracle, GsfListsEveryStreamAndReadsThem) {
  const std::string list = Output("gsf list " + path_);
  for (const auto& [path, hex] : expected_) {
    const std::string line = std::to_string(hex.size() / 2) + " " + path + "\n";
    EXPECT_NE(list.find(line), std::string::npos) << line;
  }
  for (const char* path : {"File_Version", "Default_Phone_Configuration/Mobile_Property_Info",
                           "Default_Phone_Configuration/Provisioning_Item_Files/EFS_Data/00000004"}) {
    EXPECT_EQ(Output("gsf cat " + path_ + " " + path).size(), expected_[path].size() / 2) << path;
  }
}

// More sectors of the allocation table than the header lists.
TEST(CompoundFileOracle, OlefileReadsALargeOne) {
  const test::TempFolder folder;
  CompoundStorage root;
  std::vector<uint8_t>& bytes = root.OpenOrAddStream("large").bytes;
  bytes.resize(9'000'000);
  for (size_t i = 0; i < bytes.size(); ++i) bytes[i] = static_cast<uint8_t>(i * 2654435761u >> 24);
  ASSERT_EQ(SaveCompoundFile(folder.Path("large"), root), "");
  const std::string copy =
      "import olefile, sys\n"
      "ole = olefile.OleFileIO(sys.argv[1], raise_defects=olefile.DEFECT_POTENTIAL)\n"
      "open(sys.argv[2], 'wb').write(ole.openstream('large').read())\n";
  const std::string command =
      "/usr/bin/python3 " + folder.Add("copy.py", copy) + " " + folder.Path("large") + " " + folder.Path("copy");
  ASSERT_EQ(std::system(command.c_str()), 0) << "the scripts install python3-olefile";
  EXPECT_TRUE(folder.Content("copy") == std::string(bytes.begin(), bytes.end()));
  CompoundStorage read;
  ASSERT_EQ(LoadCompoundFile(folder.Path("large"), read), "");
  EXPECT_TRUE(read.FindStream("large")->bytes == bytes);
}

INSTANTIATE_TEST_SUITE_P(BothWriters, PkvOracle, testing::Values(PkvWriter::kStorageClasses, PkvWriter::kVarnPkvFile));

}  // namespace
}  // namespace kral::pkv
