// The packet modes: how the chunks of a port become packets.
#include "transport/line/chunk_splitter.h"

#include "tests/support/log_lines.h"
#include "tests/support/plain_codec.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

Bytes Text(std::string_view text) {
  return {text.begin(), text.end()};
}

class Splitter : public testing::Test, public PacketListener {
 protected:
  void OnPacket(std::span<const uint8_t> packet) override { packets_.emplace_back(packet.begin(), packet.end()); }

  std::vector<Bytes> Feed(std::initializer_list<Bytes> chunks) {
    packets_.clear();
    for (const Bytes& chunk : chunks) splitter_.Feed(chunk);
    return packets_;
  }
  std::vector<std::string> FeedTexts(std::initializer_list<std::string_view> chunks) {
    packets_.clear();
    for (const std::string_view chunk : chunks) splitter_.Feed(Text(chunk));
    std::vector<std::string> texts;
    for (const Bytes& packet : packets_) texts.emplace_back(packet.begin(), packet.end());
    return texts;
  }

  LogLines log_;
  std::vector<Bytes> packets_;
  ChunkSplitter splitter_{*this, *log_.log()};
};

using Texts = std::vector<std::string>;

TEST_F(Splitter, UnframedChunksArePacketsWhateverTheirSize) {
  for (const PacketMode mode : {PacketMode::kUnframed1, PacketMode::kUnframed2}) {
    splitter_.SetMode(mode);
    EXPECT_EQ(Feed({{1}, {2, 3}, Bytes(40960, 4)}), (std::vector<Bytes>{{1}, {2, 3}, Bytes(40960, 4)}));
  }
}

TEST_F(Splitter, AtRepliesEndWithOkAndError) {
  struct Case {
    const char* name;
    std::initializer_list<std::string_view> chunks;
    Texts packets;
  };
  const Case cases[] = {
      {"one chunk", {"\r\nOK"}, {"\r\nOK"}},
      {"several chunks", {"+CGMM: 1\r\n", "\r\nOK"}, {"+CGMM: 1\r\n\r\nOK"}},
      {"error", {"\r\nERROR"}, {"\r\nERROR"}},
      {"the rest of the chunk is dropped", {"OK\r\nmore", "OK"}, {"OK", "OK"}},
      {"but for further letters K and R", {"OK-KaR", "OK"}, {"OK", "KROK"}},
      {"a second end in a chunk is the K kept of it", {"OK OK"}, {"OK", "K"}},
      {"an end torn apart is none", {"O", "K", " OK"}, {"OK OK"}},
      {"error torn apart is none", {"ERR", "OR", "OK"}, {"ERROROK"}},
  };
  splitter_.SetMode(PacketMode::kUnframed1);
  splitter_.SetAtReplyMode(true);
  for (const Case& c : cases) {
    splitter_.DropPartialPacket();
    EXPECT_EQ(FeedTexts(c.chunks), c.packets) << c.name;
  }
}

TEST_F(Splitter, AtReplyOf4096BytesIsHandedOnWithAnError) {
  splitter_.SetMode(PacketMode::kUnframed2);
  splitter_.SetAtReplyMode(true);
  log_.Take();
  EXPECT_EQ(Feed({Bytes(4095, 'a'), Text("aaOK")}), (std::vector<Bytes>{Bytes(4096, 'a'), Text("aOK")}));
  EXPECT_EQ(log_.Take(),
            (LogLines::Lines{"16 ERROR THREAD READ---NON-HDLC data (4096 bytes)", "1 RAW REC (3 bytes): 61 4F 4B "}));
}

TEST_F(Splitter, LengthPrefixedPacketsEndAtTheirLength) {
  splitter_.SetMode(PacketMode::kLengthPrefixed);
  const Bytes first = {0xA0, 0, 7, 1, 2, 0x10, 0};  // announces packets of up to 4,096 bytes
  const Bytes second = {0xA1, 0, 4, 9};
  EXPECT_EQ(Feed({first}), std::vector<Bytes>{first});
  EXPECT_EQ(Feed({{0xA1}, {0}, {4, 9, 0xA1, 0, 4}, {9}}), (std::vector<Bytes>{second, second})) << "any chunks";
  EXPECT_EQ(Feed({{1, 0, 0, 2, 0, 3}}), (std::vector<Bytes>{{1, 0, 0}, {2, 0, 3}})) << "never less than a header";
}

TEST_F(Splitter, HeaderLimitCutsLongerPackets) {
  struct Case {
    const char* name;
    uint8_t high, low;
    size_t limit;
  };
  for (const Case& c : {Case{"as told", 0, 16, 16}, Case{"too small to be true", 0, 6, 4096},
                        Case{"more than a packet may have", 0xFF, 0xFF, 4096}}) {
    splitter_.SetMode(PacketMode::kFramed);
    splitter_.Feed({});
    splitter_.SetMode(PacketMode::kLengthPrefixed);
    EXPECT_EQ(Feed({{0xA0, 0, 7, 1, 2, c.high, c.low}}).size(), 1u);
    log_.Take();
    Bytes lying(c.limit + 1, 0xFF);  // a length of 65,535
    EXPECT_EQ(Feed({lying}), std::vector<Bytes>{Bytes(c.limit, 0xFF)}) << c.name;
    EXPECT_EQ(log_.Take().at(0), "16 ERROR THREAD READ---NON-HDLC data (" + std::to_string(c.limit) + " bytes)");
  }
}

TEST_F(Splitter, FlushAndModeChangesDropThePartialPacket) {
  const Bytes frame = test::PlainFrame({7, 8, 9});
  const Bytes half(frame.begin(), frame.begin() + 2);
  splitter_.Feed(half);
  splitter_.DropPartialPacket();
  EXPECT_EQ(Feed({frame}), std::vector<Bytes>{test::WithFcs({7, 8, 9})});

  splitter_.Feed(half);
  splitter_.SetMode(PacketMode::kLengthPrefixed);
  splitter_.Feed(Bytes{1, 0});
  splitter_.SetMode(PacketMode::kFramed);
  EXPECT_EQ(Feed({frame}), std::vector<Bytes>{test::WithFcs({7, 8, 9})});
}

}  // namespace
}  // namespace kral
