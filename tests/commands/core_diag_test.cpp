// The core diagnostic commands: one row per function, and the flows that have more to them than a row.
#include "commands/core/core_diag_format.h"
#include "kral/kral.h"
#include "tests/support/handset_connection.h"
#include "tests/support/test.h"

namespace kral {
namespace {

// --- Rows -----------------------------------------------------------------------------------------------------------

// What a call left in its outputs: each has just its room, which begins as 0xCC throughout.
class Outputs {
 public:
  void* Add(size_t size) { return rooms_.emplace_back(size, uint8_t{0xCC}).data(); }
  // The outputs in their order, as hex.
  std::string text() const {
    std::vector<uint8_t> all;
    for (const auto& room : rooms_) all.insert(all.end(), room.begin(), room.end());
    return HexText(all);
  }

 private:
  std::deque<std::vector<uint8_t>> rooms_;
};

// Arguments that stand for a pointer to room for an output, and to the size of such room.
struct Room {
  explicit Room(size_t bytes) : size(bytes) {}
  size_t size;
};
struct RoomSize {
  explicit RoomSize(uint16_t bytes) : size(bytes) {}
  uint16_t size;
};

template <class Parameter, class Argument>
Parameter Passed([[maybe_unused]] Outputs& outputs, const Argument& argument) {
  if constexpr (std::is_same_v<Argument, Room>) {
    return static_cast<Parameter>(outputs.Add(argument.size));
  } else if constexpr (std::is_same_v<Argument, RoomSize>) {
    return static_cast<Parameter>(std::memcpy(outputs.Add(sizeof argument.size), &argument.size, sizeof argument.size));
  } else {
    return static_cast<Parameter>(argument);
  }
}

using Call = std::function<uint8_t(KRAL_HANDLE, Outputs&)>;

template <class... Parameters, class... Arguments>
Call Calling(uint8_t(KRAL_CALL* function)(KRAL_HANDLE, Parameters...), Arguments... arguments) {
  return [=](KRAL_HANDLE handle, Outputs& outputs) {
    // In braces, so that the outputs are added in their order.
    return std::apply(function,
                      std::tuple<KRAL_HANDLE, Parameters...>{handle, Passed<Parameters>(outputs, arguments)...});
  };
}

constexpr std::array<uint8_t, 3> kPokedBytes{1, 2, 3};
constexpr std::array<uint16_t, 2> kPokedWords{0x1234, 0x5678};
constexpr std::array<uint32_t, 1> kPokedDoubleWords{0x12345678};

const Call kReadVersion = Calling(KRAL_DIAG_VERNO_F, Room(11), Room(8), Room(11), Room(8), Room(8), Room(1), Room(1),
                                  Room(1), Room(2), Room(1), Room(1), Room(1));
// 55 bytes: the code, then texts and numbers, every field different from every other.
const std::string kVersionTexts =
    "4D 61 72 20 31 34 20 32 30 32 34 30 39 3A 32 36 3A 35 33 41 70 72 20 30 32 20 32 30 32 34 31 38 3A 30 30 3A 30 30 "
    "56 45 52 53 49 4F 4E 31 ";
const std::string kVersionReply = "00 " + kVersionTexts + "2A 06 91 05 01 02 03 04";

struct CallRow {
  const char* name;
  Call call;
  std::string request;
  std::string reply;
  std::string outputs;
  std::string cut = "";    // a reply that is too short for its fields
  std::string entry = "";  // the line of flag 2; empty: the name with empty parentheses
};

const CallRow kCallRows[] = {
    {"KRAL_DIAG_VERNO_F", kReadVersion, "00", kVersionReply, kVersionTexts + "2A 06 91 05 01 02 03 04"},
    {"KRAL_DIAG_MEMORY_PEEK_F", Calling(KRAL_DIAG_MEMORY_PEEK_F, 0x11223344, 4, Room(4)), "02 44 33 22 11 04 00",
     "02 44 33 22 11 04 00 DE AD BE EF", "DE AD BE EF", "02 DE AD BE"},
    {"KRAL_DIAG_MEMORY_PEEK_WORD_F", Calling(KRAL_DIAG_MEMORY_PEEK_WORD_F, 0x80000000, 2, Room(4)),
     "03 00 00 00 80 02 00", "03 00 00 00 80 02 00 34 12 78 56", "34 12 78 56", "03 78 56 34"},
    {"KRAL_DIAG_MEMORY_PEEK_DWORD_F", Calling(KRAL_DIAG_MEMORY_PEEK_DWORD_F, 0x10, 1, Room(4)), "04 10 00 00 00 01 00",
     "04 10 00 00 00 01 00 78 56 34 12", "78 56 34 12", "04 78 56 34"},
    {"KRAL_DIAG_MEMORY_POKE_F", Calling(KRAL_DIAG_MEMORY_POKE_F, 0x20, 3, kPokedBytes.data(), Room(1)),
     "05 20 00 00 00 03 00 01 02 03", "05 20 00 00 00 03 00 00", "00"},
    {"KRAL_DIAG_MEMORY_POKE_WORD_F", Calling(KRAL_DIAG_MEMORY_POKE_WORD_F, 0x20, 2, kPokedWords.data(), Room(1)),
     "06 20 00 00 00 02 00 34 12 78 56", "06 20 00 00 00 02 00 01", "01"},
    {"KRAL_DIAG_MEMORY_POKE_DWORD_F",
     Calling(KRAL_DIAG_MEMORY_POKE_DWORD_F, 0x20, 1, kPokedDoubleWords.data(), Room(1)),
     "07 20 00 00 00 01 00 78 56 34 12", "07 20 00 00 00 01 00 02", "02"},
    {"KRAL_DIAG_HS_KEY_F", Calling(KRAL_DIAG_HS_KEY_F, 1, 0x51), "20 01 51", "20 01 51", ""},
    {"KRAL_DIAG_CONTROL_F", Calling(KRAL_DIAG_CONTROL_F, 0x12), "29 02 00", "29 02 00", "", "",
     "KRAL_DIAG_CONTROL_F(eMode=2)"},
    {"KRAL_DIAG_ERR_READ_F", Calling(KRAL_DIAG_ERR_READ_F, RoomSize(4), Room(4)), "2A", "2A 01 00",
     "03 00 2A 01 00 CC"},
    {"KRAL_DIAG_ERR_CLEAR_F", Calling(KRAL_DIAG_ERR_CLEAR_F, 7), "2B 07", "2B 07", ""},
    {"KRAL_DIAG_GET_DIPSW_F", Calling(KRAL_DIAG_GET_DIPSW_F, Room(2)), "2F", "2F 34 12", "34 12", "2F 34"},
    {"KRAL_DIAG_SET_DIPSW_F", Calling(KRAL_DIAG_SET_DIPSW_F, 0x1234), "30 34 12", "30 34 12", ""},
    {"KRAL_DIAG_DLOAD_F", Calling(KRAL_DIAG_DLOAD_F), "3A", "3A", ""},
    {"KRAL_DIAG_SPC_F", Calling(KRAL_DIAG_SPC_F, "012345", Room(1)), "41 30 31 32 33 34 35", "41 77 01", "01", "",
     "KRAL_SPC( iSPC[6] = 012345)"},
    {"KRAL_DIAG_STATUS_F", Calling(KRAL_DIAG_STATUS_F, RoomSize(4), Room(4)), "4B 04 0E 00", "4B 04 0E 00 01 02 03",
     "04 00 4B 04 0E 00"},
    {"KRAL_DIAG_IS2000_STATUS_F", Calling(KRAL_DIAG_IS2000_STATUS_F, RoomSize(4), Room(4)), "70", "70 05",
     "02 00 70 05 CC CC"},
    {"KRAL_DIAG_SECURITY_FREEZE_F", Calling(KRAL_DIAG_SECURITY_FREEZE_F), "FF", "FF", ""},
    {"KRAL_DIAG_NV_CNV_DIAG_BACKUP_F", Calling(KRAL_DIAG_NV_CNV_DIAG_BACKUP_F), "80 37 00 00", "80 37 00 00", ""},
    {"KRAL_DIAG_READ_ESN_F", Calling(KRAL_DIAG_READ_ESN_F, Room(4)), "26 00 00 00 00 00 00 00 00",
     "26 00 00 78 56 34 12 00 00", "78 56 34 12", "26 00 00 78 56 34 00 00", "DIAG_READ_ESN_F() -- Start"},
};

class CoreDiag : public HandsetTest {
 protected:
  void ExpectLine(uint32_t flag, const std::string& text) {
    EXPECT_TRUE(HasLine(flag, text)) << "missing: " << text << "\nin:\n" << LogText();
  }
};

TEST_F(CoreDiag, EveryFunctionSendsItsRequestAndUnpacksTheReplyOrLeavesItsOutputs) {
  for (const CallRow& row : kCallRows) {
    SCOPED_TRACE(row.name);
    ClearLog();
    handset().Expect(row.request).Reply(row.reply);
    Outputs outputs;
    EXPECT_EQ(row.call(handle(), outputs), 1);
    EXPECT_EQ(outputs.text(), row.outputs);
    ExpectLine(0x200, row.name);
    ExpectLine(0x2, row.entry.empty() ? std::string(row.name) + "()" : row.entry);
    Outputs untouched;
    EXPECT_EQ(row.call(0, untouched), 0);
    handset().Expect(row.request).Refuse(handset::Refusal::kBadCommand);
    if (!row.cut.empty()) handset().Expect(row.request).Reply(row.cut);
    for (int i = row.cut.empty() ? 1 : 0; i < 2; ++i) {
      Outputs failed;
      EXPECT_EQ(row.call(handle(), failed), 0);
      EXPECT_EQ(failed.text(), untouched.text());
    }
    EXPECT_EQ(handset().script().Problems(), "");
  }
}

TEST_F(CoreDiag, MissingInputsAndUnwantedOutputsAreSafe) {
  const auto before = handset().request_count();
  uint16_t size = 4;
  EXPECT_EQ(KRAL_DIAG_SPC_F(handle(), nullptr, nullptr), 0);
  EXPECT_EQ(KRAL_DIAG_MEMORY_POKE_F(handle(), 0, 1, nullptr, nullptr), 0);
  EXPECT_EQ(KRAL_DIAG_MEMORY_PEEK_F(handle(), 0, 1, nullptr), 0);
  EXPECT_EQ(KRAL_DIAG_ERR_READ_F(handle(), &size, nullptr), 0);
  EXPECT_EQ(KRAL_DIAG_ERR_READ_F(handle(), nullptr, nullptr), 0);
  EXPECT_EQ(handset().request_count(), before);

  EXPECT_EQ(KRAL_DIAG_GET_DIPSW_F(handle(), nullptr), 1);
  EXPECT_EQ(KRAL_DIAG_SPC_F(handle(), "000000", nullptr), 1);
  EXPECT_EQ(KRAL_DIAG_EXT_BUILD_ID_F(handle(), nullptr, nullptr, nullptr, nullptr), 1);
  EXPECT_EQ(KRAL_DIAG_VERNO_F(handle(), nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr,
                              nullptr, nullptr, nullptr),
            1);
}

TEST_F(CoreDiag, GsmCallControlSaysThatNoRequestIsDefined) {
  const auto before = handset().request_count();
  EXPECT_EQ(KRAL_DIAG_GSM_STATUS_F(handle()), 0);
  EXPECT_EQ(KRAL_DIAG_GSM_CALL_ORIG_F(handle()), 0);
  EXPECT_EQ(KRAL_DIAG_GSM_CALL_END_F(handle()), 0);
  EXPECT_EQ(handset().request_count(), before);
  for (const char* name : {"KRAL_DIAG_GSM_STATUS_F", "KRAL_DIAG_GSM_CALL_ORIG_F", "KRAL_DIAG_GSM_CALL_END_F"}) {
    ExpectLine(0x200, name);
    ExpectLine(0x10, std::string(name) + "() -- no request is defined for this function");
  }
}

// A count beyond the packet buffer goes out without the data that did not fit; the handset then judges it.
TEST_F(CoreDiag, PokeBeyondThePacketBufferIsSentCut) {
  const std::vector<uint8_t> data(7000, 0x5A);
  uint8_t status = 0xCC;
  EXPECT_EQ(KRAL_DIAG_MEMORY_POKE_F(handle(), 0, static_cast<uint16_t>(data.size()), data.data(), &status), 0);
  EXPECT_EQ(handset().requests().back().size(), 7u);
  EXPECT_EQ(status, 0xCC);
}

TEST_F(CoreDiag, ShortVersionReplySucceedsWithWhatWasThereBefore) {
  auto reply = FromHex(kVersionReply);
  ASSERT_EQ(reply.size(), diag::version_reply::kSize);
  const auto read = [&](size_t size) {
    handset().Expect("00").Reply(ByteView(reply).first(size));
    Outputs outputs;
    EXPECT_EQ(kReadVersion(handle(), outputs), 1);
    return outputs.text();
  };
  EXPECT_EQ(read(53), HexText(std::vector<uint8_t>(54))) << "nothing was ever received: zeros";
  const std::string full = read(55);
  reply.assign(reply.size(), 0x41);
  reply[0] = 0;
  EXPECT_EQ(read(53), full) << "not taken";
  EXPECT_EQ(read(54), HexText(std::vector<uint8_t>(53, 0x41)) + " 04") << "taken, all but the field that it lacks";
  read(1);  // the command code alone
}

// --- Build identity -------------------------------------------------------------------------------------------------

struct BuildId {
  uint32_t hardware = 0xCCCCCCCC;
  uint32_t mobile_model = 0xCCCCCCCC;
  std::vector<char> revision = std::vector<char>(4096, '?');
  std::vector<char> model = std::vector<char>(4096, '?');

  uint8_t Read(KRAL_HANDLE handle) {
    return KRAL_DIAG_EXT_BUILD_ID_F(handle, &hardware, &mobile_model, revision.data(), model.data());
  }
};

TEST_F(CoreDiag, BuildIdentityIsUnpackedAndLogged) {
  handset().Expect("7C").Reply("7C 11 22 33  04 03 02 01  0D 0C 0B 0A  52 31 00  4D 44 4C 00");
  BuildId id;
  EXPECT_EQ(id.Read(handle()), 1);
  EXPECT_EQ(id.hardware, 0x01020304u);
  EXPECT_EQ(id.mobile_model, 0x0A0B0C0Du);
  EXPECT_STREQ(id.revision.data(), "R1");
  EXPECT_STREQ(id.model.data(), "MDL");
  EXPECT_EQ(id.revision[3], '?');  // nothing behind the terminator
  ExpectLine(0x2, "KRAL_DIAG_EXT_BUILD_ID_F()");
  ExpectLine(0x4,
             "KRAL_DIAG_EXT_BUILD_ID_F( iBXC_HW_Version = 16909060, iMobModel = 168496141, sMobSwRev = R1, "
             "sModelStr  = MDL)");
}

TEST_F(CoreDiag, BuildIdentityTextsEndWithWhatWasReceived) {
  struct Case {
    const char* texts;
    const char* revision;
    const char* model;
  };
  for (const Case& c : {Case{"", "", ""}, Case{"52 31", "R1", ""}, Case{"52 31 00", "R1", ""},
                        Case{"52 31 00 4D", "R1", "M"}, Case{"00 4D 00", "", "M"}}) {
    SCOPED_TRACE(c.texts);
    handset().Expect("7C").Reply(std::string("7C 00 00 00 01 00 00 00 02 00 00 00 ") + c.texts);
    BuildId id;
    EXPECT_EQ(id.Read(handle()), 1);
    EXPECT_STREQ(id.revision.data(), c.revision);
    EXPECT_STREQ(id.model.data(), c.model);
  }
  handset().Expect("7C").Reply("7C 00 00 00 01 00 00 00 02 00 00");
  BuildId id;
  EXPECT_EQ(id.Read(handle()), 0);
  EXPECT_EQ(id.hardware, 0xCCCCCCCCu);
}

TEST_F(CoreDiag, LongestBuildIdentityTextFitsTheBufferAskedFor) {
  std::vector<uint8_t> reply(4000, 'x');
  reply[0] = 0x7C;
  handset().Expect("7C").Reply(reply);
  BuildId id;
  EXPECT_EQ(id.Read(handle()), 1);
  EXPECT_EQ(std::strlen(id.revision.data()), reply.size() - 12);
}

// --- Serial number --------------------------------------------------------------------------------------------------

TEST_F(CoreDiag, SerialNumberFollowsTheNvStatus) {
  uint32_t serial = 0xCCCCCCCC;
  handset().Expect("26 00 00 ...").Reply("26 00 00 00 00 00 00 05 00");
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle(), &serial), 0);
  EXPECT_EQ(serial, 0xCCCCCCCCu);
  ExpectLine(0x4, "DIAG_READ_ESN_F() -- failed NV Read, status 5");

  handset().Expect("26 00 00 ...").Refuse(handset::Refusal::kBadParameter);
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle(), &serial), 0);
  ExpectLine(0x4, "DIAG_READ_ESN_F() -- failed NV Read");

  handset().nv().Set(0, FromHex("78 56 34 12"));  // the handset's own reply has all 128 bytes
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle(), &serial), 1);
  EXPECT_EQ(serial, 0x12345678u);
  ExpectLine(0x4, "DIAG_READ_ESN_F() -- completed ( iESN = 0x12345678)");
}

TEST_F(CoreDiag, ApplicationProcessorTargetHasNoSerialNumber) {
  Connect([] { KRAL_SetTargetType(1); });
  const auto before = handset().request_count();
  uint32_t serial = 0;
  EXPECT_EQ(KRAL_DIAG_READ_ESN_F(handle(), &serial), 1);
  EXPECT_EQ(serial, 0xDEADBEEFu);
  EXPECT_EQ(handset().request_count(), before);
  ExpectLine(0x4, "DIAG_READ_ESN() is not supported on ZTD target. Return 0xDEADBEEF ");
}

// --- Rows that do not compile ---------------------------------------------------------------------------------------

template <class CallRow, class... Fields>
concept Sendable = requires(Diag_FTM& phone, const CallRow& row, Fields... fields) {
  Send(phone, row, fields...);
};

using Pair = DiagRequest<u8, u16>;
static_assert(Sendable<Pair, u8, u16>);
static_assert(Sendable<Pair, u8, u8>);        // narrower is no harm
static_assert(!Sendable<Pair, u8>);           // missing
static_assert(!Sendable<Pair, u8, u16, u8>);  // surplus
static_assert(!Sendable<Pair, u16, u16>);     // too wide
static_assert(!Sendable<Pair, u8, s16>);      // another sign
static_assert(!Sendable<Pair, u8, bool>);
static_assert(Sendable<DiagRequest<s16>, u8> && !Sendable<DiagRequest<s16>, u16>);
static_assert(Sendable<DiagRequest<Block<6>>, std::array<u8, 6>> &&
              !Sendable<DiagRequest<Block<6>>, std::array<u8, 5>>);

}  // namespace
}  // namespace kral
