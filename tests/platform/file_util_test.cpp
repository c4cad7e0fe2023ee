// Whole files: limits of reading, and a target that changes in one step or not at all.
#include "platform/file_util.h"

#include "platform/temporary_name.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

Bytes Of(std::string_view text) {
  return {text.begin(), text.end()};
}

size_t FilesIn(const std::string& folder) {
  const std::filesystem::directory_iterator entries(folder);
  return static_cast<size_t>(std::distance(begin(entries), end(entries)));
}

TEST(ReadWholeFileTest, GivesFilesUpToTheLimitAndNothingOfLongerOnes) {
  const test::TempFolder folder;
  const std::string large(200000, 'x');
  struct Case {
    std::string content;
    size_t limit;
    bool read;
  };
  for (const Case& c :
       {Case{"", 0, true}, Case{"a\r\n\x1A z", 6, true}, Case{"abc", 2, false}, Case{"abc", 3, true},
        Case{large, large.size(), true}, Case{large, large.size() - 1, false}, Case{large, SIZE_MAX, true}}) {
    const std::string path = folder.Add("file", c.content);
    Bytes bytes = Of("kept");
    const std::error_code error = ReadWholeFile(path, c.limit, bytes);
    EXPECT_EQ(error, c.read ? std::error_code() : std::make_error_code(std::errc::file_too_large));
    EXPECT_EQ(bytes, Of(c.read ? c.content : "kept"));
  }
}

TEST(FileReaderTest, ReadsOrdinaryFilesToTheirEndAndOpensNothingElse) {
  const test::TempFolder folder;
  FileReader reader;
  EXPECT_TRUE(reader.Open(folder.Path("missing")));
  EXPECT_TRUE(reader.Open(folder.Path("")));
  ASSERT_FALSE(reader.Open(folder.Add("file", "a\r\n\x1A z")));
  EXPECT_EQ(reader.size(), 6u);
  std::array<uint8_t, 4> buffer{};
  size_t count = 0;
  for (const size_t expected : {4, 2, 0}) {
    EXPECT_FALSE(reader.Read(buffer, count));
    EXPECT_EQ(count, expected);
  }
  reader.Close();
  EXPECT_TRUE(reader.Read(buffer, count));
  EXPECT_EQ(count, 0u);
}

TEST(OpenToWriteTextTest, EmptiesNothingThatIsBeingWrittenOrRead) {
  const test::TempFolder folder;
  const std::string path = folder.Add("file", "abc");
  const auto close = [](std::FILE* stream) { CloseStream(stream); };
  using Stream = std::unique_ptr<std::FILE, decltype(close)>;
  for (const bool reads : {true, false}) {
    const Stream held(reads ? OpenToRead(path) : OpenToWrite(path), close);
    ASSERT_TRUE(held);
    if (!reads) std::fputs("abc", held.get());
    std::fflush(held.get());
    EXPECT_EQ(OpenToWriteText(path), nullptr);
    EXPECT_TRUE(IsInUse(path));
    EXPECT_EQ(std::filesystem::file_size(path), 3u);
  }
  EXPECT_FALSE(IsInUse(path));
  const Stream one(OpenToWriteText(path), close);
  const Stream two(OpenToWriteText(path), close);
  EXPECT_TRUE(one && two) << "text logs may share a file";
}

TEST(ReadWholeFileTest, AMissingFileIsNoSuchFile) {
  const test::TempFolder folder;
  Bytes bytes;
  EXPECT_EQ(ReadWholeFile(folder.Path("none"), 10, bytes), std::errc::no_such_file_or_directory);
}

TEST(AtomicFileTest, TheTargetChangesWithTheCommitOnly) {
  const test::TempFolder folder;
  const std::string path = folder.Add("target", "old");
  AtomicFile file;
  ASSERT_FALSE(file.Open(path));
  ASSERT_FALSE(file.Write(Of("new ")));
  ASSERT_FALSE(file.Write(Of("content")));
  EXPECT_EQ(folder.Content("target"), "old");
  ASSERT_FALSE(file.Commit());
  EXPECT_EQ(folder.Content("target"), "new content");
  EXPECT_EQ(FilesIn(folder.Path("")), 1u);
  EXPECT_TRUE(file.Write(Of("late")));
  EXPECT_TRUE(file.Commit());
}

TEST(AtomicFileTest, ANameMayBeAsLongAsTheSystemTakes) {
  const test::TempFolder folder;
  const std::string umlaut = "\xC3\xBC";
  const std::string name(kLongestName, 'n');
  AtomicFile file;
  ASSERT_FALSE(file.Open(folder.Add(name, "old")));
  EXPECT_EQ(FilesIn(folder.Path("")), 2u);
  ASSERT_FALSE(file.Write(Of("new")));
  ASSERT_FALSE(file.Commit());
  EXPECT_EQ(folder.Content(name), "new");
  EXPECT_EQ(TemporaryName(std::string("d/n"), 2, 12, 3), "d/n.12.3.tmp");
  // A character stays whole.
  const std::string in_front = "d/" + std::string(245, 'n');
  EXPECT_EQ(TemporaryName(in_front + umlaut, 2, 12, 3), in_front + ".12.3.tmp");
}

TEST(AtomicFileTest, WithoutACommitNothingIsLeft) {
  const test::TempFolder folder;
  {
    AtomicFile file;
    ASSERT_FALSE(file.Open(folder.Path("target")));
    ASSERT_FALSE(file.Write(Of("half")));
  }
  EXPECT_EQ(FilesIn(folder.Path("")), 0u);
}

TEST(AtomicFileTest, TwoWritersOfOneTargetDoNotMix) {
  const test::TempFolder folder;
  AtomicFile first;
  AtomicFile second;
  ASSERT_FALSE(first.Open(folder.Path("target")));
  ASSERT_FALSE(second.Open(folder.Path("target")));
  ASSERT_FALSE(first.Write(Of("first")));
  ASSERT_FALSE(second.Write(Of("second")));
  ASSERT_FALSE(second.Commit());
  ASSERT_FALSE(first.Commit());
  EXPECT_EQ(folder.Content("target"), "first");
}

TEST(AtomicFileTest, ATargetThatCannotBeReplacedStaysAndLeavesNoRest) {
  const test::TempFolder folder;
  std::filesystem::create_directories(folder.Path("target/inner"));
  EXPECT_EQ(ReplaceWholeFile(folder.Path("target"), Of("text")), std::errc::is_a_directory);
  EXPECT_EQ(FilesIn(folder.Path("")), 1u);
  EXPECT_EQ(ReplaceWholeFile(folder.Path("none/target"), Of("text")), std::errc::no_such_file_or_directory);
}

}  // namespace
}  // namespace kral
