// The core diagnostic commands: one row per function, and the flows that have more to them than a row.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "commands/core/core_diag_format.h"
#include "kral/kral.h"
#include "tests/support/handset_connection.h"

namespace kral {
namespace {

using handset::ByteView;
using handset::FromHex;
using handset::HexText;
using handset::When;

// --- Rows -----------------------------------------------------------------------------------------------------------

// What a call left in its outputs, which begin as 0xCC throughout.
class Outputs {
 public:
  template <class T>
  static T Untouched() {
    T value;
    std::memset(&value, 0xCC, sizeof value);
    return value;
  }

  template <class T>
  void Add(const T& value) {
    const auto* bytes = reinterpret_cast<const uint8_t*>(&value);
    bytes_.insert(bytes_.end(), bytes, bytes + sizeof value);
  }

  bool untouched() const {
    return std::all_of(bytes_.begin(), bytes_.end(), [](uint8_t byte) { return byte == 0xCC; });
  }
  std::string text() const { return HexText(bytes_); }

 private:
  std::vector<uint8_t> bytes_;
};

template <class T, class Call>
uint8_t WithOutput(Outputs& outputs, Call call) {
  auto value = Outputs::Untouched<T>();
  const uint8_t result = call(&value);
  outputs.Add(value);
  return result;
}

// Reads a raw reply into room of four bytes; its size comes first in the outputs once it was changed.
template <class Call>
uint8_t WithReply(Outputs& outputs, Call call) {
  auto reply = Outputs::Untouched<std::array<uint8_t, 4>>();
  uint16_t size = reply.size();
  const uint8_t result = call(&size, reply.data());
  outputs.Add(size == reply.size() && result == 0 ? uint16_t{0xCCCC} : size);
  outputs.Add(reply);
  return result;
}

constexpr std::array<uint8_t, 3> kPokedBytes{1, 2, 3};
constexpr std::array<uint16_t, 2> kPokedWords{0x1234, 0x5678};
constexpr std::array<uint32_t, 1> kPokedDoubleWords{0x12345678};

struct Row {
  const char* name;
  std::function<uint8_t(KRAL_HANDLE, Outputs&)> call;
  const char* request;
  const char* reply;
  const char* outputs;
  std::string entry;  // the line of flag 2; empty: the name with empty parentheses
};

const std::vector<Row>& Rows() {
  static const std::vector<Row> rows{
      {"KRAL_DIAG_MEMORY_PEEK_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<std::array<uint8_t, 4>>(
             out, [h](auto* data) { return KRAL_DIAG_MEMORY_PEEK_F(h, 0x11223344, 4, data->data()); });
       },
       "02 44 33 22 11 04 00", "02 44 33 22 11 04 00 DE AD BE EF", "DE AD BE EF", ""},
      {"KRAL_DIAG_MEMORY_PEEK_WORD_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<std::array<uint16_t, 2>>(
             out, [h](auto* data) { return KRAL_DIAG_MEMORY_PEEK_WORD_F(h, 0x80000000, 2, data->data()); });
       },
       "03 00 00 00 80 02 00", "03 00 00 00 80 02 00 34 12 78 56", "34 12 78 56", ""},
      {"KRAL_DIAG_MEMORY_PEEK_DWORD_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint32_t>(out, [h](auto* data) { return KRAL_DIAG_MEMORY_PEEK_DWORD_F(h, 0x10, 1, data); });
       },
       "04 10 00 00 00 01 00", "04 10 00 00 00 01 00 78 56 34 12", "78 56 34 12", ""},
      {"KRAL_DIAG_MEMORY_POKE_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint8_t>(
             out, [h](auto* status) { return KRAL_DIAG_MEMORY_POKE_F(h, 0x20, 3, kPokedBytes.data(), status); });
       },
       "05 20 00 00 00 03 00 01 02 03", "05 20 00 00 00 03 00 00", "00", ""},
      {"KRAL_DIAG_MEMORY_POKE_WORD_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint8_t>(
             out, [h](auto* status) { return KRAL_DIAG_MEMORY_POKE_WORD_F(h, 0x20, 2, kPokedWords.data(), status); });
       },
       "06 20 00 00 00 02 00 34 12 78 56", "06 20 00 00 00 02 00 01", "01", ""},
      {"KRAL_DIAG_MEMORY_POKE_DWORD_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint8_t>(out, [h](auto* status) {
           return KRAL_DIAG_MEMORY_POKE_DWORD_F(h, 0x20, 1, kPokedDoubleWords.data(), status);
         });
       },
       "07 20 00 00 00 01 00 78 56 34 12", "07 20 00 00 00 01 00 02", "02", ""},
      {"KRAL_DIAG_HS_KEY_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_HS_KEY_F(h, 1, 0x51); }, "20 01 51",
       "20 01 51", "", ""},
      {"KRAL_DIAG_CONTROL_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_CONTROL_F(h, 0x12); }, "29 02 00",
       "29 02 00", "", "KRAL_DIAG_CONTROL_F(eMode=2)"},
      {"KRAL_DIAG_ERR_READ_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithReply(out, [h](auto* size, auto* reply) { return KRAL_DIAG_ERR_READ_F(h, size, reply); });
       },
       "2A", "2A 01 00", "03 00 2A 01 00 CC", ""},
      {"KRAL_DIAG_ERR_CLEAR_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_ERR_CLEAR_F(h, 7); }, "2B 07", "2B 07",
       "", ""},
      {"KRAL_DIAG_GET_DIPSW_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint16_t>(out, [h](auto* switches) { return KRAL_DIAG_GET_DIPSW_F(h, switches); });
       },
       "2F", "2F 34 12", "34 12", ""},
      {"KRAL_DIAG_SET_DIPSW_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_SET_DIPSW_F(h, 0x1234); }, "30 34 12",
       "30 34 12", "", ""},
      {"KRAL_DIAG_DLOAD_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_DLOAD_F(h); }, "3A", "3A", "", ""},
      {"KRAL_DIAG_SPC_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint8_t>(out, [h](auto* result) { return KRAL_DIAG_SPC_F(h, "012345", result); });
       },
       "41 30 31 32 33 34 35", "41 77 01", "01", "KRAL_SPC( iSPC[6] = 012345)"},
      {"KRAL_DIAG_STATUS_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithReply(out, [h](auto* size, auto* reply) { return KRAL_DIAG_STATUS_F(h, size, reply); });
       },
       "4B 04 0E 00", "4B 04 0E 00 01 02 03", "04 00 4B 04 0E 00", ""},
      {"KRAL_DIAG_IS2000_STATUS_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithReply(out, [h](auto* size, auto* reply) { return KRAL_DIAG_IS2000_STATUS_F(h, size, reply); });
       },
       "70", "70 05", "02 00 70 05 CC CC", ""},
      {"KRAL_DIAG_SECURITY_FREEZE_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_SECURITY_FREEZE_F(h); }, "FF",
       "FF", "", ""},
      {"KRAL_DIAG_NV_CNV_DIAG_BACKUP_F", [](KRAL_HANDLE h, Outputs&) { return KRAL_DIAG_NV_CNV_DIAG_BACKUP_F(h); },
       "80 37 00 00", "80 37 00 00", "", ""},
      {"KRAL_DIAG_READ_ESN_F",
       [](KRAL_HANDLE h, Outputs& out) {
         return WithOutput<uint32_t>(out, [h](auto* serial) { return KRAL_DIAG_READ_ESN_F(h, serial); });
       },
       "26 00 00 00 00 00 00 00 00", "26 00 00 78 56 34 12 00 00", "78 56 34 12", "DIAG_READ_ESN_F() -- Start"},
  };
  return rows;
}

class CoreDiag : public HandsetTest {
 protected:
  void ExpectLine(uint32_t flag, const std::string& text) {
    EXPECT_TRUE(HasLine(flag, text)) << "missing: " << text << "\nin:\n" << LogText();
  }
};

TEST_F(CoreDiag, EveryFunctionSendsItsRequestAndUnpacksTheReply) {
  for (const Row& row : Rows()) {
    SCOPED_TRACE(row.name);
    ClearLog();
    handset().Expect(row.request).Reply(row.reply);
    Outputs outputs;
    EXPECT_EQ(row.call(handle(), outputs), 1);
    EXPECT_EQ(outputs.text(), row.outputs);
    ExpectLine(0x200, row.name);
    ExpectLine(0x2, row.entry.empty() ? std::string(row.name) + "()" : row.entry);
    EXPECT_EQ(handset().script().Problems(), "");
  }
}

TEST_F(CoreDiag, RefusedRequestGivesZeroAndLeavesOutputsUntouched) {
  for (const Row& row : Rows()) {
    SCOPED_TRACE(row.name);
    handset().Expect(row.request).Refuse(handset::Refusal::kBadCommand);
    Outputs outputs;
    EXPECT_EQ(row.call(handle(), outputs), 0);
    EXPECT_TRUE(outputs.untouched()) << outputs.text();
    EXPECT_EQ(handset().script().Problems(), "");
  }
}

TEST_F(CoreDiag, ReplyTooShortForItsFieldsGivesZero) {
  const std::array<std::pair<const char*, const char*>, 5> cut{{
      {"KRAL_DIAG_MEMORY_PEEK_F", "02 DE AD BE"},
      {"KRAL_DIAG_MEMORY_PEEK_WORD_F", "03 78 56 34"},
      {"KRAL_DIAG_MEMORY_PEEK_DWORD_F", "04 78 56 34"},
      {"KRAL_DIAG_GET_DIPSW_F", "2F 34"},
      {"KRAL_DIAG_READ_ESN_F", "26 00 00 78 56 34 00 00"},
  }};
  for (const auto& [name, reply] : cut) {
    SCOPED_TRACE(name);
    const auto row =
        std::find_if(Rows().begin(), Rows().end(), [name = name](const Row& r) { return r.name == std::string(name); });
    handset().Expect(row->request).Reply(reply);
    Outputs outputs;
    EXPECT_EQ(row->call(handle(), outputs), 0);
    EXPECT_TRUE(outputs.untouched()) << outputs.text();
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

// --- Version --------------------------------------------------------------------------------------------------------

struct Version {
  std::array<char, 11> compile_date = Outputs::Untouched<std::array<char, 11>>();
  std::array<char, 8> compile_time = Outputs::Untouched<std::array<char, 8>>();
  std::array<char, 11> release_date = compile_date;
  std::array<char, 8> release_time = compile_time;
  std::array<char, 8> directory = compile_time;
  uint8_t station_class = 0xCC, air = 0xCC, model = 0xCC, slot_cycle = 0xCC, vocoder_major = 0xCC, vocoder_minor = 0xCC;
  uint16_t firmware = 0xCCCC;

  uint8_t Read(KRAL_HANDLE handle) {
    return KRAL_DIAG_VERNO_F(handle, compile_date.data(), compile_time.data(), release_date.data(), release_time.data(),
                             directory.data(), &station_class, &air, &model, &firmware, &slot_cycle, &vocoder_major,
                             &vocoder_minor);
  }
  bool operator==(const Version&) const = default;
};

template <size_t N>
std::string Text(const std::array<char, N>& characters) {
  return {characters.data(), characters.size()};
}

// 55 bytes in which every field can be told from every other.
std::vector<uint8_t> VersionReply() {
  const std::string texts = "Mar 14 202409:26:53Apr 02 202418:00:00VERSION1";
  return handset::ByteWriter().U8(0).Characters(texts, texts.size()).Raw(FromHex("2A 06 91 05 01 02 03 04")).Take();
}

TEST_F(CoreDiag, VersionFillsAllTwelveOutputs) {
  ASSERT_EQ(VersionReply().size(), diag::version_reply::kSize);
  handset().Expect("00").Reply(VersionReply());
  Version version;
  EXPECT_EQ(version.Read(handle()), 1);
  EXPECT_EQ(Text(version.compile_date), "Mar 14 2024");
  EXPECT_EQ(Text(version.compile_time), "09:26:53");
  EXPECT_EQ(Text(version.release_date), "Apr 02 2024");
  EXPECT_EQ(Text(version.release_time), "18:00:00");
  EXPECT_EQ(Text(version.directory), "VERSION1");
  EXPECT_EQ(version.station_class, 0x2A);
  EXPECT_EQ(version.air, 6);
  EXPECT_EQ(version.model, 0x91);
  EXPECT_EQ(version.firmware, 0x0105);
  EXPECT_EQ(version.slot_cycle, 2);
  EXPECT_EQ(version.vocoder_major, 3);
  EXPECT_EQ(version.vocoder_minor, 4);
  ExpectLine(0x200, "KRAL_DIAG_VERNO_F");
  ExpectLine(0x2, "KRAL_DIAG_VERNO_F()");
}

TEST_F(CoreDiag, ShortVersionReplySucceedsWithWhatWasThereBefore) {
  auto reply = VersionReply();
  const auto answer = [&](size_t size) { handset().Expect("00").Reply(ByteView(reply).first(size)); };

  answer(53);  // nothing was ever received: zeros
  Version version;
  EXPECT_EQ(version.Read(handle()), 1);
  EXPECT_EQ(version.compile_date[0], 0);
  EXPECT_EQ(version.vocoder_minor, 0);

  answer(55);
  Version full;
  EXPECT_EQ(full.Read(handle()), 1);

  reply.assign(reply.size(), 0x41);
  reply[0] = 0;
  answer(53);  // not taken
  EXPECT_EQ(version.Read(handle()), 1);
  EXPECT_EQ(version, full);

  answer(54);  // taken, all but the field that it lacks
  EXPECT_EQ(version.Read(handle()), 1);
  EXPECT_EQ(version.vocoder_major, 0x41);
  EXPECT_EQ(version.vocoder_minor, full.vocoder_minor);

  answer(1);  // the command code alone
  EXPECT_EQ(version.Read(handle()), 1);
}

TEST_F(CoreDiag, RefusedVersionLeavesOutputsUntouched) {
  handset().Expect("00").Refuse(handset::Refusal::kBadMode);
  Version version;
  EXPECT_EQ(version.Read(handle()), 0);
  EXPECT_EQ(version, Version());
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

template <class Row, class... Fields>
concept Sendable = requires(Diag_FTM& phone, const Row& row, Fields... fields) {
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
