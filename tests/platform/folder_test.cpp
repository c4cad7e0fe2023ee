// Folders of the PC: what they hold, and making them.
#include "platform/folder.h"

#include "platform/file_mapping.h"
#include "platform/file_util.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

TEST(Folder, HoldsFilesAndFolders) {
  const test::TempFolder temp;
  EXPECT_FALSE(MakeFolder(temp.Path("b")));
  EXPECT_FALSE(MakeFolder(temp.Path("b"))) << "it is there";
  temp.Add("b/inside", "");
  temp.Add("a", "123");
  EXPECT_TRUE(MakeFolder(temp.Path("a"))) << "a file is in the way";
  EXPECT_TRUE(MakeFolder(temp.Path("none/x")));

  std::vector<FolderEntry> entries(1);
  EXPECT_FALSE(ListFolder(temp.Path(""), entries));
  ASSERT_EQ(entries.size(), 2u);
  EXPECT_EQ(entries[0].name, "a");
  EXPECT_EQ(entries[0].file.kind, LocalKind::kFile);
  EXPECT_EQ(entries[0].file.size, 3u);
  EXPECT_EQ(entries[1].name, "b");
  EXPECT_EQ(entries[1].file.kind, LocalKind::kFolder);
  EXPECT_TRUE(ListFolder(temp.Path("none"), entries));
  EXPECT_TRUE(ListFolder(temp.Path("a"), entries));

  EXPECT_EQ(LookAt(JoinPath(temp.Path("b"), "inside")).kind, LocalKind::kFile);
  EXPECT_EQ(LookAt(temp.Path("b")).kind, LocalKind::kFolder);
  EXPECT_EQ(LookAt(temp.Path("none")).kind, LocalKind::kMissing);
}

// The standard library, told that a name is UTF-8, finds the same file.
TEST(Folder, NamesAreUtf8) {
  const test::TempFolder temp;
  const std::string name = "gr\xC3\xBCn \xE6\x97\xA5 \xF0\x9F\x93\xB1";
  const std::string folder = JoinPath(temp.Path("x"), name);
  const std::string file = JoinPath(folder, name);
  EXPECT_FALSE(MakeFolder(temp.Path("x")));
  EXPECT_FALSE(MakeFolder(folder));
  EXPECT_FALSE(ReplaceWholeFile(file, std::vector<uint8_t>{'1', '2'}));
  const std::u8string wide(name.begin(), name.end());
  EXPECT_TRUE(std::filesystem::exists(std::filesystem::path(temp.Path("x")) / wide / wide));
  EXPECT_EQ(LookAt(file).size, 2u);
  EXPECT_NE(CMapFileToMemory().Open(file, false), nullptr);
  std::vector<FolderEntry> entries;
  EXPECT_FALSE(ListFolder(folder, entries));
  ASSERT_EQ(entries.size(), 1u);
  EXPECT_EQ(entries[0].name, name);
  EXPECT_FALSE(RemoveFile(file));
  EXPECT_EQ(LookAt(file).kind, LocalKind::kMissing);
  EXPECT_TRUE(RemoveFile(file));
}

TEST(Folder, PathsMayBeLong) {
  const test::TempFolder temp;
  std::string path = temp.Path("x");
  for (const char letter : {'a', 'b', 'c'}) {
    EXPECT_FALSE(MakeFolder(path)) << path;
    path = JoinPath(path, std::string(120, letter));
  }
  for (int round = 0; round < 2; ++round) {
    EXPECT_FALSE(ReplaceWholeFile(path, std::vector<uint8_t>{'1', '2'})) << "new, and in place of the first";
  }
  std::vector<uint8_t> bytes;
  EXPECT_FALSE(ReadWholeFile(path, 10, bytes));
  EXPECT_EQ(bytes.size(), 2u);
  EXPECT_NE(CMapFileToMemory().Open(path, true), nullptr);
  std::vector<FolderEntry> entries;
  EXPECT_FALSE(ListFolder(path.substr(0, path.size() - 121), entries));
  ASSERT_EQ(entries.size(), 1u);
  EXPECT_EQ(entries[0].file.size, 2u);
}

}  // namespace
}  // namespace kral
