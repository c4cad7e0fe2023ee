// Listing directories: types, filters, names, and replies that are not to be believed.
#include "tests/support/efs_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

class EfsDirectory : public test::EfsTest {
 protected:
  struct Listing {
    uint8_t result;
    std::vector<std::string> lines;  // "type name"
  };
  Listing List(const char* folder, uint8_t filter = KRAL_EFS_FILTER_ALL) {
    std::vector<KRAL_EFS_ENTRY> entries(100);
    auto count = static_cast<uint32_t>(entries.size());
    Listing listing{KRAL_EfsDirectory(handle(), folder, filter, entries.data(), &count), {}};
    for (uint32_t i = 0; listing.result == 1 && i < count; ++i) {
      listing.lines.push_back(std::to_string(entries[i].type) + " " + entries[i].name);
    }
    return listing;
  }
};

using Lines = std::vector<std::string>;

TEST_F(EfsDirectory, TypesAreSwappedAndFiltersGoByTheHandsets) {
  handset().efs().AddDirectory("/dir");
  handset().efs().AddFile("/file", Bytes{1});
  handset().efs().AddItemFile("/item", Bytes{1});
  handset().efs().AddLink("/link", "/file");
  EXPECT_EQ(List("/").lines, (Lines{"0 /dir", "1 /file", "1 /item", "2 /link"}));
  EXPECT_EQ(List("/", 0).lines, (Lines{"1 /file", "1 /item"}));
  EXPECT_EQ(List("/", 1).lines, Lines{"0 /dir"});
  EXPECT_EQ(List("/", 2).lines, Lines{"2 /link"});
  for (const uint8_t nothing : {3, 4, 254}) EXPECT_EQ(List("/", nothing).lines, Lines{}) << int{nothing};
  EXPECT_EQ(List("").lines.size(), 4u) << "an empty path is the root";
  EXPECT_EQ(List(nullptr).lines.size(), 4u);
}

TEST_F(EfsDirectory, WireIsAsGiven) {
  handset().Expect("4B 13 0B 00 2F 64 00").Reply("4B 13 0B 00 05000000 00000000");
  handset()
      .Expect("4B 13 0C 00 05000000 01000000")
      .Reply("4B 13 0C 00 05000000 01000000 00000000 07000000 A4810000 10000000 11000000 12000000 13000000 61 62 00");
  handset()
      .Expect("4B 13 0C 00 05000000 02000000")
      .Reply("4B 13 0C 00 05000000 02000000 00000000 00000000 00000000 00000000 00000000 00000000 00000000 00");
  handset().Expect("4B 13 0D 00 05000000").Reply("4B 13 0D 00 00000000");
  KRAL_EFS_ENTRY entry{};
  uint32_t count = 1;
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/d", 255, &entry, &count), 1) << LogText();
  EXPECT_EQ(count, 1u);
  EXPECT_EQ((std::vector{entry.type, entry.mode, entry.size, entry.access_time, entry.modify_time, entry.change_time}),
            (std::vector<uint32_t>{0, 0x81A4, 16, 17, 18, 19}))
      << "types that the handset alone knows are reported as 0";
  EXPECT_STREQ(entry.name, "/d/ab");
}

std::vector<std::string> g_seen;

TEST_F(EfsDirectory, CallbackAndListGetTheSelectedEntries) {
  for (const char* name : {"/d/a", "/d/b", "/d/c"}) handset().efs().AddFile(name, {});
  handset().efs().AddDirectory("/d/sub");
  g_seen.clear();
  KRAL_ConfigureEfs2CallBacks(handle(), nullptr,
                              [](const KRAL_EFS_ENTRY* entry, KRAL_HANDLE) { g_seen.emplace_back(entry->name); });
  KRAL_EFS_ENTRY entries[2] = {};
  uint32_t count = 2;
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/d/", 0, entries, &count), 1);
  EXPECT_EQ(count, 3u) << "all that were selected";
  EXPECT_STREQ(entries[1].name, "/d/b") << "no second slash";
  EXPECT_EQ(g_seen, (Lines{"/d/a", "/d/b", "/d/c"}));

  g_seen.clear();
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/d", 255, nullptr, nullptr), 1);
  EXPECT_EQ(g_seen.size(), 4u);

  KRAL_ConfigureEfs2CallBacks(handle(), nullptr,
                              [](const KRAL_EFS_ENTRY*, KRAL_HANDLE context) { KRAL_AbortEFS_Operation(context); });
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/d", 255, nullptr, nullptr), 0) << "aborted";
}

TEST_F(EfsDirectory, FailuresAreNamedAndCloseTheDirectory) {
  EXPECT_EQ(List("/missing").result, 0);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "KRAL_EfsDirectory( sFolderPath = /missing ) - Failed"));
  handset().efs().AddFile("/file", {});
  EXPECT_EQ(List("/file").result, 0);

  const auto answer = [&](Bytes reply) {
    handset().OnSubsystem(19, 12, {}, [reply](handset::ByteView, handset::Wire& wire) { wire.Send(reply); });
  };
  const auto entry = [](uint32_t directory, uint32_t sequence, uint32_t error, std::string_view name) {
    return ByteWriter()
        .Raw(handset::FromHex("4B 13 0C 00"))
        .U32(directory)
        .U32(sequence)
        .U32(error)
        .Raw(Bytes(24))
        .Raw(Bytes(name.begin(), name.end()))
        .Take();
  };
  using namespace std::literals;
  ShortenTimeOuts();
  for (const Bytes& reply :
       {entry(1, 1, 0, "name without end"), entry(1, 2, 0, "late\0"sv), entry(2, 1, 0, "b\0"sv), entry(1, 1, 9, "\0"sv),
        entry(1, 1, 0, ""), entry(1, 1, 0, std::string(600, 'n') + '\0'), handset::FromHex("4B 13 0C 00 01")}) {
    answer(reply);
    uint32_t count = 77;
    EXPECT_EQ(KRAL_EfsDirectory(handle(), "/", 255, nullptr, &count), 0);
    EXPECT_EQ(count, 77u);
    EXPECT_EQ(handset().efs().open_directories(), 0u);
  }
}

TEST_F(EfsDirectory, EntriesCostOneRoundTripEach) {
  for (int i = 0; i < 500; ++i) handset().efs().AddFile("/many/" + std::to_string(1000 + i), {});
  uint32_t count = 0;
  const uint64_t before = handset().request_count();
  test::PhoneLog quiet(handle(), 0);
  EXPECT_EQ(KRAL_EfsDirectory(handle(), "/many", 255, nullptr, &count), 1);
  EXPECT_EQ(count, 500u);
  EXPECT_EQ(handset().request_count() - before, 503u);
}

}  // namespace
}  // namespace kral
