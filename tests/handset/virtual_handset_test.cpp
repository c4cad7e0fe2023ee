// The virtual handset without the library: its services, its modes, its scripts and its trace.
#include "handset/virtual_handset.h"

#include "handset/line/wire_modes.h"
#include "handset/loaders/boot_loader.h"
#include "tests/support/fake_clock.h"
#include "tests/support/handset_host.h"
#include "tests/support/test.h"

namespace kral::handset {
namespace {

class Handset : public testing::Test {
 protected:
  std::string Mode() {
    const std::string reply = host_.Ask("4B 0F 00 00");
    return reply.size() < 26 ? "(" + reply + ")" : reply.substr(24, 2);
  }

  test::FakeClock clock_;
  VirtualHandset handset_{Identity{}, clock_};
  test::HandsetHost host_{handset_};
};

TEST_F(Handset, AnswersEveryCoreRequest) {
  handset_.memory().Store(0xFFFFFFFE, FromHex("DE AD BE"));  // wraps around
  handset_.maintenance().AddErrorRecord(FromHex("AA BB"));
  handset_.maintenance().AddErrorRecord(FromHex("CC"));
  handset_.maintenance().SetStatusRecord(FromHex("51 52"));
  handset_.maintenance().SetIs2000StatusRecord(FromHex("61"));
  struct Row {
    const char* request;
    const char* reply;
  };
  for (const Row& row : {
           Row{"7B 00 7E 7D", "7B 00 7E 7D"},
           Row{"4B 32 03 00 00 00 00 00 00 00 00 00", "4B 32 03 00 00 00 00 00 00 00 00 00"},
           Row{"02 FE FF FF FF 04 00", "02 FE FF FF FF 04 00 DE AD BE FF"},
           Row{"06 00 10 00 00 02 00 34 12 78 56", "06 00 10 00 00 02 00 00"},
           Row{"03 00 10 00 00 02 00", "03 00 10 00 00 02 00 34 12 78 56"},
           Row{"04 00 10 00 00 01 00", "04 00 10 00 00 01 00 34 12 78 56"},
           Row{"20 01 51", "20 01 51"},
           Row{"2A", "2A 02 00 02 AA BB 01 01 CC"},
           Row{"2B 00", "2B 00"},
           Row{"2A", "2A 01 00 01 CC"},
           Row{"30 CD AB", "30 CD AB"},
           Row{"2F", "2F CD AB"},
           Row{"41 31 32 33 34 35 36", "41 00"},
           Row{"41 30 30 30 30 30 30", "41 01"},
           Row{"4B 04 0E 00", "4B 04 0E 00 51 52"},
           Row{"70", "70 61"},
           Row{"80 37 00 00", "80 37 00 00"},
           Row{"FF", "FF"},
       }) {
    EXPECT_EQ(host_.Ask(row.request), row.reply);
  }
  EXPECT_EQ(handset_.maintenance().keys(), (std::vector<KeyPress>{{1, 0x51}}));
  EXPECT_TRUE(handset_.maintenance().unlocked());
  EXPECT_TRUE(handset_.maintenance().frozen());
  EXPECT_EQ(handset_.maintenance().backups(), 1u);
}

TEST_F(Handset, RefusesWhatItCannotDo) {
  struct Row {
    const char* request;
    const char* code;
  };
  for (const Row& row : {
           Row{"99 01", "13"},                       // unknown command
           Row{"4B", "13"},                          // a subsystem request without its header
           Row{"4B 0F 63 00", "13"},                 // unknown subsystem command
           Row{"80 38 00 00", "13"},                 // another subsystem of the backup's code
           Row{"00 00", "15"},                       // too long
           Row{"29 03", "15"},                       // too short
           Row{"05 00 00 00 00 03 00 01 02", "15"},  // fewer bytes than told
           Row{"04 00 00 00 00 FF FF", "14"},        // more than a reply can hold
           Row{"29 06 00", "14"},                    // no such mode
           Row{"2B 00", "14"},                       // no such record
       }) {
    EXPECT_EQ(host_.Ask(row.request), std::string(row.code) + " " + row.request);
  }
}

TEST_F(Handset, SwitchesItsModeAfterTheDelay) {
  handset_.mode().SetSwitchingDelay(100);
  EXPECT_EQ(Mode(), "05");
  struct Row {
    const char* order;
    const char* state;
  };
  const char* before = "05";
  for (const Row& row : {Row{"29 03 00", "01"}, Row{"29 00 00", "02"}, Row{"29 01 00", "03"}, Row{"29 05 00", "06"},
                         Row{"29 04 00", "05"}}) {
    EXPECT_EQ(host_.Ask(row.order), row.order);
    clock_.Advance(99);
    EXPECT_EQ(Mode(), before);
    clock_.Advance(1);
    EXPECT_EQ(Mode(), row.state);
    before = row.state;
  }
}

TEST_F(Handset, ResetIsSilentForItsTimeAndBootsAsNvSays) {
  handset_.nv().Set(kFtmBootItem, FromHex("01"));
  handset_.mode().SetResetTime(2000);
  EXPECT_EQ(host_.Ask("29 02 00"), "29 02 00");
  clock_.Advance(1999);
  EXPECT_EQ(Mode(), "()");
  clock_.Advance(1);
  EXPECT_EQ(Mode(), "01");
  handset_.nv().Set(kFtmBootItem, FromHex("00"));
  handset_.Restart();
  EXPECT_EQ(Mode(), "05");
}

TEST_F(Handset, AtModemSwitchesToDiagnosticMode) {
  const auto modem = std::make_shared<AtModem>();
  modem->Answer("ATI", "\r\nVH\r\nOK\r\n");
  handset_.EnterMode(modem);
  const auto type = [this](const std::string& text) {
    handset_.FromHost(Bytes(text.begin(), text.end()));
    const Bytes reply = host_.ReadBytes();
    return std::string(reply.begin(), reply.end());
  };
  EXPECT_EQ(type("~ATI\r"), "\r\nVH\r\nOK\r\n");
  EXPECT_EQ(type("hello\r"), "\r\nERROR\r\n");
  EXPECT_EQ(type("AT$XJ"), "");
  EXPECT_EQ(type("DMG\r"), "\r\nOK\r\n");
  EXPECT_EQ(host_.Ask("2F"), "2F 34 12");

  EXPECT_EQ(host_.Ask("44"), "44 01");
  EXPECT_EQ(type("AT\r"), "\r\nOK\r\n");
  handset_.Restart();
  handset_.mode().SetPacketMode(nullptr);
  EXPECT_EQ(host_.Ask("44"), "44 00");
  EXPECT_EQ(host_.Ask("2F"), "2F 34 12");
}

TEST_F(Handset, FollowsItsScriptAndThenItself) {
  handset_.Expect("2F").Reply("2F 01 00").Reply("60 00");
  handset_.Expect("27 C5 01 ?? 00 ...").Refuse(Refusal::kBadMode);
  handset_.Expect("7B").ReplyUnframed("AA");
  handset_.Expect("7B");
  EXPECT_EQ(host_.Ask("2F"), "2F 01 00 | 60 00");
  EXPECT_EQ(host_.Ask("27 C5 01 99 00 55 66"), "18 27 C5 01 00 00");
  host_.Send("7B");
  EXPECT_EQ(host_.Read(), "AA");
  EXPECT_FALSE(handset_.ScriptConsumed());
  EXPECT_EQ(host_.Ask("7B"), "");
  EXPECT_TRUE(handset_.ScriptConsumed());
  EXPECT_EQ(handset_.script().Problems(), "");
  EXPECT_EQ(host_.Ask("2F"), "2F 34 12");
}

TEST_F(Handset, ScriptShowsBothDumpsAndTheOffsetOfADifference) {
  handset_.Expect("26 C5 01 00");
  handset_.Expect("2F");
  EXPECT_EQ(host_.Ask("26 C5 02 00"), "13 26 C5 02 00");
  EXPECT_FALSE(handset_.ScriptConsumed());
  EXPECT_EQ(handset_.script().Problems(),
            "request 1 differs at offset 2; awaited 4 bytes\n"
            "  0000: 26 C5 01 00\n"
            "but got 4 bytes\n"
            "  0000: 26 C5 02 00\n"
            "never asked: 1 of 2 requests, the first of them\n"
            "  0000: 2F\n");
  EXPECT_EQ(host_.Ask("2F 00"), "13 2F 00");  // one byte too many
  EXPECT_FALSE(handset_.ScriptConsumed());
  EXPECT_THROW(handset_.Expect("2F 3"), std::invalid_argument);
  EXPECT_THROW(handset_.Expect("2G"), std::invalid_argument);
}

TEST_F(Handset, TraceHoldsRequestsAndRawBytes) {
  const Bytes frame = EncodeFrame(FromHex("7D"));
  handset_.FromHost(FromHex("7E"));
  handset_.FromHost(frame);
  handset_.FromHost(EncodeCorruptFrame(FromHex("2F")));
  EXPECT_EQ(handset_.requests(), std::vector<Bytes>{FromHex("7D")});
  EXPECT_EQ(HexText(handset_.received()).substr(0, 3 + frame.size() * 3 - 1), "7E " + HexText(frame));
  EXPECT_EQ(handset_.damaged_frames(), 1u);
  handset_.KeepTrace(false);
  handset_.ClearTrace();
  host_.Send("2F");
  EXPECT_TRUE(handset_.requests().empty());
  EXPECT_TRUE(handset_.received().empty());
  EXPECT_EQ(handset_.request_count(), 2u);
}

TEST_F(Handset, OutputThatNobodyReadsIsBounded) {
  const Bytes packet(1 << 20, 0x60);
  for (int i = 0; i < 40; ++i) handset_.SendUnframed(packet);
  size_t taken = 0;
  Bytes buffer(1 << 16);
  for (size_t count = handset_.ToHost(buffer); count > 0; count = handset_.ToHost(buffer)) taken += count;
  EXPECT_LE(taken, OutputLine::kCapacity);
  EXPECT_GT(taken, OutputLine::kCapacity / 2);
  EXPECT_EQ(host_.Ask("2F"), "2F 34 12");
}

TEST(HandsetThreads, ManyThreadsMayUseIt) {
  VirtualHandset handset;
  std::atomic<bool> stop = false;
  std::atomic<size_t> read = 0;
  std::thread reader([&] {
    Bytes buffer(4096);
    while (!stop) {
      handset.WaitForOutput(1);
      read += handset.ToHost(buffer);
    }
  });
  std::thread events([&] {
    for (int i = 0; i < 500; ++i) handset.SendPacket(FromHex("60 00"));
  });
  for (int i = 0; i < 500; ++i) {
    handset.FromHost(EncodeFrame(FromHex("2F")));
    handset.maintenance().SetSwitches(static_cast<uint16_t>(i));
    handset.requests();
  }
  events.join();
  while (handset.MillisecondsToOutput() != OutputLine::kNever) std::this_thread::yield();
  stop = true;
  reader.join();
  EXPECT_EQ(handset.request_count(), 500u);
  EXPECT_GE(read.load(), 500 * (EncodeFrame(FromHex("60 00")).size() + 6));
}

TEST(HandsetBootLoader, HostThatMakesAMistakeIsHeardNoMore) {
  VirtualHandset handset;
  test::HandsetHost host(handset);
  const auto loader = std::make_shared<BootLoader>();
  handset.EnterMode(loader);
  host.Read();
  handset.FromHost(FromHex("0D 00 00 00 0C 00 00 00 02 00 00 00"));
  EXPECT_NE(loader->problem(), "");
  handset.FromHost(FromHex("05 00 00 00 08 00 00 00"));
  EXPECT_EQ(host.Read(), "");
  EXPECT_FALSE(loader->transferred());
}

}  // namespace
}  // namespace kral::handset
