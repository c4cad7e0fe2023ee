// Folders of the PC: what they hold, and making them.
#include "platform/folder.h"

#include <gtest/gtest.h>

#include "tests/support/temp_folder.h"

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

}  // namespace
}  // namespace kral
