// Commands by definition: what files may say, the bytes that calls send, and what becomes of the replies.
#include <cmath>
#include <cstdlib>
#include <cstring>

#include "base/deflate.h"
#include "base/diag_packet.h"
#include "kral/cmd.h"
#include "kral/error.h"
#include "tests/support/failures.h"
#include "tests/support/ftm_command_rows.h"
#include "tests/support/ftm_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

class DefinedCommands : public test::FtmTest {
 protected:
  uint8_t Load(const std::string& definitions) {
    return KRAL_CMD_LoadDefinitions(handle(), folder_.Add("commands.xml", definitions).c_str(), nullptr);
  }
  void LoadExample() {
    ASSERT_EQ(KRAL_CMD_LoadDefinitions(handle(), KRAL_EXAMPLES "/commands.xml", nullptr), 1) << Error().text;
  }
  KRAL_ERROR Error() const {
    KRAL_ERROR error{};
    KRAL_GetLastError(handle(), &error);
    return error;
  }
  uint32_t Count() const {
    uint32_t count = 99;
    KRAL_CMD_GetCount(handle(), &count);
    return count;
  }
  // The reply as JSON, or why there is none.
  std::string Call(const char* command, const char* fields) {
    std::array<char, 4096> reply{};
    return KRAL_CMD_Call(handle(), command, fields, reply.data(), reply.size()) == 1 ? reply.data() : Error().text;
  }

 private:
  test::TempFolder folder_;
};

std::string Repeated(const std::string& text, size_t times) {
  std::string all;
  for (size_t i = 0; i < times; ++i) all += text;
  return all;
}

// A file with these lines as the request of a command; they begin on line 2.
std::string WithRequest(const std::string& fields, const std::string& shared = "") {
  return "<CommandDefinition><Family name='F' frame='diag'><Command name='C' id='200'><Request>\n" + fields +
         "</Request></Command></Family>\n" + shared + "</CommandDefinition>";
}

TEST_F(DefinedCommands, ContradictionsAreRefusedWithTheirLineAndChangeNothing) {
  const std::string in_itself =
      "<Record name='A'>\n<Field name='b' type='B'/></Record>\n"
      "<Record name='B'><Field name='a' type='A'/></Record>\n";
  constexpr uint32_t kParsers = UINT32_MAX;  // the line that the parser begins its text with
  const struct {
    std::string file;
    uint32_t line;
    const char* reason;
  } kRows[] = {
      {"<Commands/>", 1, "the root element is <Commands>"},
      {"<CommandDefinition>\n\n<Famly/></CommandDefinition>", 3, "<Famly> is not expected"},
      {"<CommandDefinition><!-- >\n< -->\n<Family name='F' frame='ftm'/></CommandDefinition>", 3,
       "<Family> without mode"},
      {"<CommandDefinition>\n<Family name='F' frame='usb'/></CommandDefinition>", 2, "none of ftm"},
      {"<CommandDefinition>\n<Family name='F' frame='diag' mode='1'/></CommandDefinition>", 2, "has no mode"},
      {"<CommandDefinition>\n<Family name='F G' frame='diag'/></CommandDefinition>", 2, "letters, digits"},
      {"<CommandDefinition><Family name='F' frame='diag'>\n<Command name='C' id='256'/></Family></CommandDefinition>",
       2, "id=\"256\" is out of range"},
      {"<CommandDefinition><Family name='F' frame='diag'><Command name='C' id='1'/>\n<Command name='C' "
       "id='2'/></Family>"
       "</CommandDefinition>",
       2, "two commands of the name C"},
      {WithRequest("<Field name='a' type='u8'/>\n<Field name='a' type='u8'/>"), 3, "a: there are two fields"},
      {WithRequest("<Field name='a' type='u9'/>"), 2, "there is no type or record u9"},
      {WithRequest("<Field name='a' type='u8' max='256'/>"), 2, "max=\"256\" is no value of u8"},
      {WithRequest("<Field name='a' type='u8' min='5' max='4'/>"), 2, "min is greater than max"},
      {WithRequest("<Field name='a' type='u8' max='4' default='5'/>"), 2, "the default is out of range: 0 to 4"},
      {WithRequest("<Field name='a' type='u8' enum='E'/>"), 2, "there is no enumeration E"},
      {WithRequest("<Field name='a' type='u8' enum='E'/>",
                   "<Enumeration name='E'><Value name='x' value='256'/></Enumeration>"),
       2, "x of enumeration E is no value of u8"},
      {WithRequest("", "<Enumeration name='E'><Value name='x' value='1'/>\n<Value name='x' value='2'/></Enumeration>"),
       4, "two values of the name x"},
      {WithRequest("<Field name='w' type='u8'><Bit name='x' bits='0-3'/>\n<Bit name='y' bits='3'/></Field>"), 3,
       "w.y: bits=\"3\" overlap"},
      {WithRequest("<Field name='w' type='u8'>\n<Bit name='x' bits='8'/></Field>"), 3, "are not some of 0 to 7"},
      {WithRequest("<Field name='w' type='s8'>\n<Bit name='x' bits='1'/></Field>"), 2, "only unsigned words"},
      {WithRequest("<Field name='a' type='u8' count='n'/>"), 2, "there is no earlier field n"},
      {WithRequest("<Field name='n' type='u32'/><Field name='a' type='u8' count='n'/>"), 2, "more than 64 KiB"},
      {WithRequest("<Field name='n' type='u16'/><Field name='a' type='u32' count='n'/>"), 2, "more than 64 KiB"},
      {WithRequest("<Field name='a' type='u8' count='70000'/>"), 2, "out of range: 1 to 65536"},
      {WithRequest("<Field name='a' type='record' count='300'>\n<Field name='b' type='u8' count='300'/></Field>"), 3,
       "a.b: more than 65,536 elements"},
      {WithRequest("<Field name='a' type='bytes' size='*'/>\n<Field name='b' type='u8'/>"), 2, "takes all the rest"},
      {WithRequest("<Field name='a' type='record' count='2'><Field name='b' type='bytes' size='*'/></Field>"), 2,
       "a: its last field takes all the rest"},
      {WithRequest("<Field name='a' type='bytes'/>"), 2, "there is no size"},
      {WithRequest("<Field name='a' type='u8' size='1'/>"), 2, "a size is for texts"},
      {WithRequest("<Field name='a' type='u8' when='b=1'/>"), 2, "there is no earlier field b"},
      {WithRequest("<Field name='b' type='u8'/><Field name='a' type='u8' when='b=256'/>"), 2, "b never is 256"},
      {WithRequest("<Field name='b' type='u8' count='2'/><Field name='a' type='u8' when='b=1'/>"), 2, "b is an array"},
      {WithRequest("<Field name='a' type='u8' success='0'/>"), 1, "a status in its request"},
      {WithRequest("<Field name='a' type='u8' defualt='0'/>"), 2, "has no attribute defualt"},
      {WithRequest("<Field name='a' type='bytes' size='7000'/>"), 1, "of more than 6128 bytes"},
      {"<CommandDefinition><Family name='F' frame='subsystem' subsystem='250'>\n<Command name='C' id='1'><Reply>"
       "<Field name='a' type='bytes' size='4088'/></Reply></Command></Family></CommandDefinition>",
       2, "a reply of 4092 bytes: none of more than 4091 is received"},
      {"<CommandDefinition note='1'/>", 1, "<CommandDefinition> has no attribute note"},
      {"<CommandDefinition>\n<Family name='F' frame='diag' bus='1'/></CommandDefinition>", 2, "has no attribute bus"},
      {"<CommandDefinition><Family name='F' frame='diag'>\n<Command name='C' id='1' dok='x'/></Family>"
       "</CommandDefinition>",
       2, "<Command> has no attribute dok"},
      {"<CommandDefinition><Family name='F' frame='diag'><Command name='C' id='1'>\n<Request longer='1'/></Command>"
       "</Family></CommandDefinition>",
       2, "<Request> has no attribute longer"},
      {"<CommandDefinition><Family name='F' frame='diag'><Command name='C' id='1'><Reply>\n"
       "<Field name='a' type='u8' max='3' success='9'/></Reply></Command></Family></CommandDefinition>",
       2, "success=\"9\" is out of range: 0 to 3"},
      {WithRequest("", "<Record name='R' doc='x'><Field name='a' type='u8'/></Record>"), 3,
       "<Record> has no attribute"},
      {WithRequest("", "<Record name='u8'><Field name='a' type='u16'/></Record>"), 3, "u8 is a type"},
      {WithRequest("", "<Enumeration name='E' doc='x'/>"), 3, "<Enumeration> has no attribute doc"},
      {WithRequest("", "<Enumeration name='E'>\n<Value name='x' value='1' doc='x'/></Enumeration>"), 4,
       "<Value> has no attribute doc"},
      {WithRequest("", "<Enumeration name='E'>\n<Value name='x' value='1'><Bit/></Value></Enumeration>"), 4,
       "<Bit> is not expected in <Value>"},
      {WithRequest("", "<Enumeration name='E'>\n<Value name='a&#9;b' value='1'/></Enumeration>"), 4, "has a blank"},
      {WithRequest("<Field name='w' type='u8'><Bit name='x' bits='0'><Bit name='y' bits='1'/></Bit></Field>"), 2,
       "<Bit> is not expected in <Bit>"},
      {WithRequest("<Field name='a' type='u8'>max=5</Field>"), 2, "<Field> has text: \"max=5\""},
      {WithRequest("<Field name='k' type='u8'/>\n<Field name='a' type='bytes' size='*' when='k=1,2'/>"
                   "<Field name='b' type='bytes' size='*' when='k=2'/>"),
       3, "a: it takes all the rest"},
      {WithRequest("<Field name='k' type='u8'/>\n<Field name='g' type='record'>"
                   "<Field name='a' type='bytes' size='*' when='k=1'/><Field name='b' type='u8' when='k!=1'/></Field>"
                   "<Field name='c' type='u8'/>"),
       3, "g: it takes all the rest"},
      {WithRequest("<Field name='n' type='u8' min='20'/>\n<Field name='a' type='u8' count='n' max_count='10'/>"), 3,
       "n is at least 20, and it takes at most 10"},
      {WithRequest("<Field name='n' type='u8' default='20'/>\n<Field name='a' type='text' size='n' max_size='10'/>"), 3,
       "n is by default 20"},
      {WithRequest("<Field name='b' type='u8' max='3'/>\n<Field name='a' type='u8' when='b=7'/>"), 3, "b never is 7"},
      {WithRequest("", in_itself), 5, "the record A contains itself"},
      {WithRequest("", "<Record name='R'>\n<Field name='a' type='u8' when='outside=1'/></Record>"), 4,
       "no earlier field outside"},
      {"<!DOCTYPE x [<!ENTITY a 'b'>]><CommandDefinition/>", 0, "cannot be used"},
      {"<CommandDefinition>", kParsers, "cannot be used: line "},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.reason);
    EXPECT_EQ(Load(row.file), 0);
    const KRAL_ERROR error = Error();
    EXPECT_EQ(error.code, uint32_t{KRAL_ERROR_BAD_FILE});
    const char* const reason = std::strstr(error.text, row.reason);
    EXPECT_NE(reason, nullptr) << error.text;
    const bool told = reason != nullptr && row.line == kParsers;
    EXPECT_EQ(error.line, told ? std::strtoul(reason + std::strlen(row.reason), nullptr, 10) : row.line) << error.text;
    const std::string line = error.line != 0 ? "line " + std::to_string(error.line) + ": " : "";
    EXPECT_NE(std::string(error.text).find("cannot be used: " + line), std::string::npos) << error.text;
    EXPECT_EQ(Count(), 0u);
    KRAL_CMD_ClearDefinitions(handle());
  }
}

TEST_F(DefinedCommands, AreAddedListedDescribedAndCleared) {
  LoadExample();
  EXPECT_EQ(Count(), 4u);
  EXPECT_EQ(KRAL_CMD_LoadDefinitions(handle(), KRAL_EXAMPLES "/commands.xml", nullptr), 0) << "the same again";
  EXPECT_NE(std::string(Error().text).find("WLAN.TX_START is defined already"), std::string::npos) << Error().text;
  EXPECT_NE(Error().line, 0u);
  std::array<char, 128> name{};
  EXPECT_EQ(KRAL_CMD_GetName(handle(), 3, name.data(), name.size()), 1);
  EXPECT_STREQ(name.data(), "SENSOR.READ");
  EXPECT_EQ(KRAL_CMD_GetName(handle(), 4, name.data(), name.size()), 0);
  uint32_t length = 0;
  ASSERT_EQ(KRAL_CMD_DescribeLength(handle(), "WLAN.SET_TABLE", &length), 1);
  std::string text(length, '\0');
  EXPECT_EQ(KRAL_CMD_Describe(handle(), "WLAN.SET_TABLE", text.data(), length - 1), 0);
  ASSERT_EQ(KRAL_CMD_Describe(handle(), "WLAN.SET_TABLE", text.data(), length), 1);
  EXPECT_STREQ(text.c_str(),
               R"({"name":"WLAN.SET_TABLE","id":6,"doc":"Sets the power of several channels","frame":"ftm","mode":22,)"
               R"("request":[{"name":"count","type":"u8","range":"0 to 14","max":14,"index":0},)"
               R"({"name":"points","type":"record","count":"count","max_count":14,"fields":[)"
               R"({"name":"channel","type":"u8","range":"1 to 14","min":1,"max":14,"index":1},)"
               R"({"name":"power","type":"s16","unit":"0.01 dBm","range":"-4000 to 3000 0.01 dBm","min":-4000,)"
               R"("max":3000,"index":2}]},{"name":"label","type":"text","size":8,"default":"","index":3}],)"
               R"("reply":[{"name":"status","type":"u16","range":"0 to 65535","success":[0],"index":0}]})");
  KRAL_CMD_COMMAND command{};
  command.size = sizeof command;
  ASSERT_EQ(KRAL_CMD_GetCommand(handle(), "WLAN.SET_TABLE", &command), 1);
  EXPECT_EQ(command.id, 6u);
  EXPECT_EQ(command.mode_id, 22u);
  EXPECT_EQ(command.request_fields, 5u);
  KRAL_CMD_FIELD field{};
  field.size = sizeof field;
  ASSERT_EQ(KRAL_CMD_GetField(handle(), "WLAN.SET_TABLE", 0, 3, &field), 1);
  EXPECT_EQ(field.index, 2u);
  EXPECT_STREQ(field.path, "points.power");
  EXPECT_STREQ(field.unit, "0.01 dBm");
  EXPECT_EQ(field.least, -4000);
  EXPECT_EQ(field.depth, 1u);
  EXPECT_EQ(KRAL_CMD_GetField(handle(), "WLAN.SET_TABLE", 0, 5, &field), 0);
  EXPECT_EQ(KRAL_CMD_ClearDefinitions(handle()), 1);
  EXPECT_EQ(Call("WLAN.TX_START", "channel=1"), "there is no command WLAN.TX_START among the 0 that are defined");
}

TEST_F(DefinedCommands, SendTheirBytesAndReadTheReplies) {
  LoadExample();
  const std::string tx = "4B 0B 16 00 05 00 ";
  const std::string table = "4B 0B 16 00 06 00 ";
  const std::string get = "4B 0B 16 00 07 00";
  const std::string sensor = "4B FA 03 00 ";
  const struct {
    const char* command;
    const char* fields;
    std::string request;
    std::string reply;
    std::string json;
  } kRows[] = {
      {"WLAN.TX_START", "channel=6", tx + "06 03 01 00", tx + "00 00 00 00 48 C1", R"({"status":0,"power":-12.5})"},
      {"WLAN.TX_START", " flags.antenna=2 flags.preamble=0\tchannel=0x0E rate=54M ", tx + "0E 0C 20 00",
       tx + "00 00 00 00 C0 7F", R"({"status":0,"power":null})"},
      {"WLAN.SET_TABLE",
       "points[0].channel=1 points[0].power=-5 points[1].channel=2 points[1].power=3000 label=\"a b\"",
       table + "02 01 FB FF 02 B8 0B 61 20 62 00 00 00 00 00", table + "00 00", R"({"status":0})"},
      {"WLAN.SET_TABLE", "", table + "00 00 00 00 00 00 00 00 00", table + "00 00", R"({"status":0})"},
      {"WLAN.GET_TABLE", "", get, get + " 00 00 01 01 FB FF 0E 00 00",
       R"({"status":0,"version":1,"points":[{"channel":1,"power":-5},{"channel":14,"power":0}]})"},
      {"WLAN.GET_TABLE", "", get, get + " 00 00 00", R"({"status":0,"version":0})"},
      {"SENSOR.READ", "sensor=7 kind=11M limit=-2", sensor + "07 03 FF FF FF FE",
       sensor + "00 01 00 00 54 22 C3 A4 FF 00 02 AB 01",
       R"({"value":65536,"name":"T\"ä\ufffd","raw_size":2,"raw":"AB01"})"},
      {"SENSOR.READ", "sensor=1", sensor + "01 00", sensor + "00 00 00 01 00 00",
       R"({"value":1,"name":"","raw_size":0,"raw":""})"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(std::string(row.command) + " " + row.fields);
    handset().Expect(row.request).Reply(row.reply);
    EXPECT_EQ(Call(row.command, row.fields), row.json);
  }
}

TEST_F(DefinedCommands, WhatDoesNotSuitTheDefinitionIsNotSent) {
  LoadExample();
  const struct {
    const char* command;
    const char* fields;
    const char* reason;
  } kRows[] = {
      {"WLAN.NONE", "", "there is no command WLAN.NONE among the 4"},
      {"WLAN.TX_START", "", "channel is missing: 1 to 14"},
      {"WLAN.TX_START", "channel=15", "channel=15 is out of range: 1 to 14"},
      {"WLAN.TX_START", "channel=six", "channel=six is out of range: 1 to 14"},
      {"WLAN.TX_START", "channel=1 rate=12M", "rate=12M is out of range: 1M, 11M, 54M"},
      {"WLAN.TX_START", "channel=1 speed=2", "there is no field speed"},
      {"WLAN.TX_START", "channel=1 channel=2", "channel is given twice"},
      {"WLAN.TX_START", "channel[0]=1", "the field is no array"},
      {"WLAN.TX_START", "flags=1", "flags is a group"},
      {"WLAN.TX_START", "channel", "not of the form field=value"},
      {"WLAN.TX_START", "channel=1 flags.antenna=3", "flags.antenna=3 is out of range: 0 to 2"},
      {"WLAN.SET_TABLE", "points[0].channel=1 points[0].power=3001",
       "points.power=3001 is out of range: -4000 to 3000 0.01 dBm"},
      {"WLAN.SET_TABLE", "points[1].channel=1 points[1].power=0", "points.channel is missing"},
      {"WLAN.SET_TABLE", "points[14].channel=1", "0 to 13"},
      {"WLAN.SET_TABLE", "points.channel=1", "which element is not said"},
      {"WLAN.SET_TABLE", "count=0 points[0].channel=1", "points.channel (element 0) has no place"},
      {"WLAN.SET_TABLE", "label=123456789", "label has 9 bytes: it takes at most 8"},
      {"WLAN.SET_TABLE", "label=\"1", "a quotation mark is missing"},
      {"SENSOR.READ", "sensor=1 limit=5", "limit has no place"},
      {"SENSOR.READ", "sensor=1 kind=11M", "limit is missing: -2147483648 to 2147483647"},
  };
  const size_t before = Traffic();
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.fields);
    const std::string text = Call(row.command, row.fields);
    EXPECT_NE(text.find(row.reason), std::string::npos) << text;
    EXPECT_EQ(Error().code, uint32_t{KRAL_ERROR_ARGUMENT});
  }
  EXPECT_EQ(Traffic(), before);
}

TEST_F(DefinedCommands, RepliesThatAreNotAsDefinedAreNoReplies) {
  LoadExample();
  const std::string get = "4B 0B 16 00 07 00";
  const struct {
    const char* command;
    std::string reply;
    uint32_t code;
    const char* reason;
  } kRows[] = {
      {"WLAN.GET_TABLE", get, KRAL_ERROR_LINK, "0 bytes, is not as defined: it is too short: status takes 2"},
      {"WLAN.GET_TABLE", get + " 00 00", KRAL_ERROR_LINK, "too short: version takes 1"},
      {"WLAN.GET_TABLE", get + " 05 00", KRAL_ERROR_REFUSED, "the handset refused WLAN.GET_TABLE: status is 5"},
      {"WLAN.GET_TABLE", get + " 00 00 00 AA", KRAL_ERROR_LINK, "longer than defined: 1 of its 4 bytes"},
      {"WLAN.GET_TABLE", get + " 00 00 01 01 FB", KRAL_ERROR_LINK,
       "too short: points.power takes 2 bytes, and there are 1"},
      {"WLAN.GET_TABLE", get + " 00 00 02 78 9C 01", KRAL_ERROR_LINK, "packed is no whole zlib stream"},
      {"WLAN.GET_TABLE", get + " 00 00 02 78 9C 03 00 00 00 00 01 00", KRAL_ERROR_LINK,
       "packed is longer than its stream"},
      {"SENSOR.READ", "4B FA 03 00 00 00 00 01 41 41", KRAL_ERROR_LINK, "name is not terminated"},
      {"SENSOR.READ", "4B FA 03 00 00 00 00 01 " + Repeated("6E ", 33) + "00 01 02", KRAL_ERROR_LINK,
       "name takes at most 32 bytes"},
      {"SENSOR.READ", "4B FA 03 00 00 00 00 01 00 FF 41", KRAL_ERROR_LINK, "raw takes 255 bytes, and there are 1"},
      {"SENSOR.READ", "14 4B FA 03 00", KRAL_ERROR_REFUSED, "with 20"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.reason);
    handset().Expect("4B ...").Reply(row.reply);
    const std::string text = Call(row.command, row.command[0] == 'S' ? "sensor=1" : "");
    EXPECT_NE(text.find(row.reason), std::string::npos) << text;
    EXPECT_EQ(Error().code, row.code);
    uint32_t length = 0;
    EXPECT_EQ(KRAL_CMD_GetReplyLength(handle(), &length), 0) << "of a reply that was none";
  }
}

// Every type, array, text and stream goes out and comes back as it was: the handset repeats the request.
TEST_F(DefinedCommands, EveryKindOfFieldComesBackAsItWasSent) {
  const std::string fields = R"(
    <Field name="u24" type="u24"/><Field name="s40" type="s40" order="big"/><Field name="u64" type="u64"/>
    <Field name="f64" type="f64"/><Field name="f32" type="f32" order="big"/><Field name="array" type="s8" count="3"/>
    <Field name="w" type="u32" order="big" count="2"><Bit name="low" bits="0-6" signed="1"/><Bit name="top" bits="31"/></Field>
    <Field name="n" type="u8"/><Field name="m" type="u16"/>
    <Field name="rows" type="Row" count="n"/>
    <Field name="packed" type="zlib" size="m"><Field name="rows" type="Row" count="*"/></Field>
    <Field name="rest" type="bytes" size="*"/>)";
  const std::string record =
      R"(<Record name="Row"><Field name="k" type="u8"/><Field name="v" type="u16" count="k" max_count="4"/>
    <Field name="t" type="text" size="terminated" max_size="9" when="k!=0"/></Record>)";
  ASSERT_EQ(
      Load("<CommandDefinition>" + record + "<Family name='F' frame='diag'><Command name='ECHO' id='200'><Request>" +
           fields + "</Request><Reply>" + fields + "</Reply></Command></Family></CommandDefinition>"),
      1)
      << Error().text;
  handset().On(200, handset::Length::AtLeast(1), [](ByteView request, handset::Wire& wire) { wire.Send(request); });
  EXPECT_EQ(Call("F.ECHO",
                 "u24=0xABCDEF s40=-549755813888 u64=18446744073709551615 f64=-0.1 f32=0.1 array=-1,0,127 w[0].low=-64 "
                 "w[0].top=1 w[1].low=63 w[1].top=0 rows[0].v=1,2 rows[0].t=x rows[1].k=0 packed.rows[0].v=65535 "
                 "packed.rows[0].t=\"\" rest=\"01 fe\""),
            R"({"u24":11259375,"s40":-549755813888,"u64":18446744073709551615,"f64":-0.1,"f32":0.1,"array":[-1,0,127],)"
            R"("w":[{"low":-64,"top":1},{"low":63,"top":0}],"n":2,"m":12,"rows":[{"k":2,"v":[1,2],"t":"x"},)"
            R"({"k":0,"v":[]}],"packed":{"rows":[{"k":1,"v":[65535],"t":""}]},"rest":"01FE"})");
  const std::string sent = LastRequest();
  EXPECT_EQ(
      sent.substr(0, sent.find(" 78 DA ")),
      "C8 EF CD AB 80 00 00 00 00 FF FF FF FF FF FF FF FF 9A 99 99 99 99 99 B9 BF 3D CC CC CD FF 00 7F 80 00 00 40 "
      "00 00 00 3F 02 0C 00 02 01 00 02 00 78 00 00")
      << sent;
}

// What counts stands in the same group as what it counts, or in one around it.
TEST_F(DefinedCommands, CountsFollowFromWhatTheyCountWhereverItIs) {
  handset().On(200, handset::Length::AtLeast(1), [](ByteView request, handset::Wire& wire) { wire.Send(request); });
  const struct {
    const char* definition;
    const char* fields;
    const char* request;
  } kRows[] = {
      {"<Field name='g' type='record'><Field name='l' type='u8' count='n'/></Field>", "g.l=1,2", "C8 02 01 02"},
      {"<Field name='g' type='record'><Field name='l' type='text' size='n'/></Field>", "g.l=ab", "C8 02 61 62"},
      {"<Field name='l' type='bytes' size='n' count='2'/>", "l=AABB,CCDD", "C8 02 AA BB CC DD"},
      {"<Field name='g' type='record' count='2'><Field name='l' type='u8' count='n'/></Field>", "g[0].l=1,2 g[1].l=3,4",
       "C8 02 01 02 03 04"},
      {"<Field name='m' type='u8'/><Field name='z' type='zlib' size='m'><Field name='g' type='record'>"
       "<Field name='k' type='u8'/><Field name='l' type='u8' count='n'/><Field name='t' type='text' size='k'/></Field>"
       "</Field>",
       "z.g.l=1,2 z.g.t=abc", "C8 02 0E 78 DA"},
      {"<Field name='m' type='u8'/><Field name='g' type='record' count='n' max_count='3'>"
       "<Field name='t' type='text' size='m' default='abc'/></Field>",
       "n=1", "C8 01 03 61 62 63"},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.definition);
    KRAL_CMD_ClearDefinitions(handle());
    ASSERT_EQ(Load(WithRequest(std::string("<Field name='n' type='u8' max='9'/>") + row.definition)), 1)
        << Error().text;
    EXPECT_EQ(KRAL_CMD_Call(handle(), "F.C", row.fields, nullptr, 0), 1) << Error().text;
    EXPECT_EQ(LastRequest().substr(0, std::strlen(row.request)), row.request);
  }
  KRAL_CMD_ClearDefinitions(handle());
  ASSERT_EQ(Load(WithRequest(std::string("<Field name='n' type='u8'/>") + kRows[3].definition)), 1) << Error().text;
  EXPECT_EQ(Call("F.C", "g[0].l=1 g[1].l=3,4"), "F.C is not sent: g.l is missing: 0 to 255");
}

TEST_F(DefinedCommands, AnArrayGivenAsAWholeLeavesNothingOfTheOneBefore) {
  handset().On(200, handset::Length::AtLeast(1), [](ByteView request, handset::Wire& wire) { wire.Send(request); });
  ASSERT_EQ(Load(WithRequest("<Field name='n' type='u8'/><Field name='l' type='u8' count='n'/>")), 1) << Error().text;
  uint32_t call = 0;
  ASSERT_EQ(KRAL_CMD_Prepare(handle(), "F.C", &call), 1);
  const std::pair<const char*, const char*> kRows[] = {
      {"l=1,2,3", "C8 03 01 02 03"}, {"l=9", "C8 01 09"}, {"l[1]=8", "C8 02 09 08"}, {"l=", "C8 00"}};
  for (const auto& [fields, request] : kRows) {
    ASSERT_EQ(KRAL_CMD_SetFields(handle(), call, fields), 1);
    ASSERT_EQ(KRAL_CMD_Send(handle(), call), 1) << Error().text;
    EXPECT_EQ(LastRequest(), request);
  }
  EXPECT_EQ(Call("F.C", "l=1,2,3 l[1]=9"), "F.C: l[1] is given twice");
  EXPECT_EQ(Call("F.C", "l[1]=9 l[0]=2 l=1"), "F.C: l is given twice");
  EXPECT_EQ(KRAL_CMD_Call(handle(), "F.C", "l[1]=9 l[0]=2", nullptr, 0), 1) << Error().text;
}

// 0.1 and 0.3 are a little more in 32 bits than in 64.
TEST_F(DefinedCommands, LimitsOfShortRealsAreAsShort) {
  handset().On(200, handset::Length::AtLeast(1), [](ByteView request, handset::Wire& wire) { wire.Send(request); });
  ASSERT_EQ(Load("<CommandDefinition xmlns:xsi='http://www.w3.org/2001/XMLSchema-instance' "
                 "xsi:noNamespaceSchemaLocation='CommandDefinition.xsd'><Family name='F' frame='diag'>"
                 "<Command name='C' id='200'><Request><Field name='f' type='f32' min='0.1' max='0.3'/></Request>"
                 "</Command></Family></CommandDefinition>"),
            1)
      << Error().text;
  uint32_t call = 0;
  ASSERT_EQ(KRAL_CMD_Prepare(handle(), "F.C", &call), 1);
  for (const double value : {0.1, double{0.1F}, 0.3, double{0.3F}}) {
    EXPECT_EQ(KRAL_CMD_SetReal(handle(), call, 0, 0, value), 1) << Error().text;
    EXPECT_EQ(KRAL_CMD_Send(handle(), call), 1) << Error().text;
    EXPECT_EQ(LastRequest(), value < 0.2 ? "C8 CD CC CC 3D" : "C8 9A 99 99 3E");
  }
  EXPECT_EQ(KRAL_CMD_SetReal(handle(), call, 0, 0, 0.30000004), 0);
  EXPECT_EQ(Call("F.C", "f=0.31"), "F.C: f=0.31 is out of range: 0.1 to 0.3");
}

TEST_F(DefinedCommands, RepliesAreBoundedByWhatIsReceivedAndKept) {
  std::string conditional;
  for (int i = 0; i < 40; ++i) conditional.append("<Field name='f" + std::to_string(i) + "' type='u8' when='k=7'/>");
  ASSERT_EQ(Load("<CommandDefinition><Family name='F' frame='subsystem' subsystem='250'>"
                 "<Command name='LONGEST' id='1'><Reply><Field name='a' type='bytes' size='4087'/></Reply></Command>"
                 "<Command name='SPARSE' id='2'><Reply><Field name='z' type='zlib' size='*'>"
                 "<Field name='g' type='record' count='*' max_count='30000'><Field name='k' type='u16'/>" +
                 conditional +
                 "</Field></Field></Reply></Command>"
                 "<Command name='COUNT' id='3'><Reply><Field name='n' type='s8' min='0'/>"
                 "<Field name='l' type='u8' count='n'/></Reply></Command>"
                 "<Command name='STATUS' id='4'><Reply><Field name='s' type='u64' success='0'/></Reply></Command>"
                 "</Family></CommandDefinition>"),
            1)
      << Error().text;
  handset().Expect("4B FA 01 00").Reply("4B FA 01 00 " + Repeated("5A ", 4087));
  EXPECT_EQ(KRAL_CMD_Call(handle(), "F.LONGEST", "", nullptr, 0), 1) << Error().text;
  std::vector<uint8_t> plain(size_t{2} * 30000 + 40);
  plain[size_t{2} * 29999] = 7;
  handset().Expect("4B FA 02 00").Reply("4B FA 02 00 " + HexText(Compress(plain)));
  EXPECT_NE(Call("F.SPARSE", "").find("makes more than 1,048,576 elements"), std::string::npos) << Error().text;
  EXPECT_EQ(Error().code, uint32_t{KRAL_ERROR_LINK});
  handset().Expect("4B FA 03 00").Reply("4B FA 03 00 FF");
  EXPECT_NE(Call("F.COUNT", "").find("n=-1: l has at most 127 "), std::string::npos) << Error().text;
  handset().Expect("4B FA 04 00").Reply("4B FA 04 00 00 00 00 00 01 00 00 00");
  EXPECT_NE(Call("F.STATUS", "").find("s is 4294967296"), std::string::npos) << Error().text;
  EXPECT_EQ(Error().status, UINT32_MAX);
}

// The handset has a stricter file than the library.
TEST_F(DefinedCommands, TheVirtualHandsetRefusesWhatIsLongerThanItsFileSays) {
  const auto definitions = [](const char* most_bytes, const char* most_elements) {
    return std::string(
               "<CommandDefinition><Family name='F' frame='subsystem' subsystem='250'><Command name='C' id='1'>"
               "<Request><Field name='t' type='text' size='terminated' max_size='") +
           most_bytes + "'/><Field name='l' type='u8' count='*' max_count='" + most_elements +
           "'/></Request></Command></Family></CommandDefinition>";
  };
  test::TempFolder folder;
  handset().LoadCommands(folder.Add("handset.xml", definitions("4", "2")));
  ASSERT_EQ(Load(definitions("9", "9")), 1) << Error().text;
  EXPECT_EQ(KRAL_CMD_Call(handle(), "F.C", "t=abcd l=1,2", nullptr, 0), 1) << Error().text;
  EXPECT_EQ(KRAL_CMD_Call(handle(), "F.C", "t=abcde l=1,2", nullptr, 0), 0);
  EXPECT_EQ(KRAL_CMD_Call(handle(), "F.C", "t=abcd l=1,2,3", nullptr, 0), 0);
  EXPECT_EQ(Error().code, uint32_t{KRAL_ERROR_REFUSED}) << Error().text;
}

TEST_F(DefinedCommands, TheVirtualHandsetRemembersWhatIsSet) {
  LoadExample();
  handset().LoadCommands(KRAL_EXAMPLES "/commands.xml");
  handset().defined().Set("WLAN.version", "2");
  handset().defined().Set("WLAN.packed.points[0].channel", "14");
  handset().defined().Set("SENSOR.value", "-1");
  handset().defined().Set("SENSOR.name", "T1");
  handset().defined().Set("SENSOR.raw", "ab");
  EXPECT_EQ(Call("WLAN.TX_START", "channel=14 flags.antenna=2"), R"({"status":0,"power":0})");
  EXPECT_EQ(handset().defined().Value("WLAN.flags.antenna"), "2");
  EXPECT_EQ(Call("WLAN.GET_TABLE", ""), R"({"status":0,"version":2,"packed":{"points":[{"channel":14,"power":0}]}})");
  EXPECT_EQ(Call("SENSOR.READ", "sensor=7 kind=54M limit=-7"), R"({"value":-1,"name":"T1","raw_size":2,"raw":"6162"})");
  EXPECT_EQ(handset().defined().Value("SENSOR.limit"), "-7");
  ASSERT_EQ(KRAL_CMD_ClearDefinitions(handle()), 1);
  const std::string inner =
      "<CommandDefinition><Family name='I' frame='subsystem' subsystem='251' order='big'><Command name='C' "
      "id='1'><Reply>"
      "<Field name='n' type='u8' max='4'/><Field name='w' type='u16'><Bit name='m' bits='4-11' max='9'/></Field>"
      "<Field name='g' type='record'><Field name='l' type='u8' count='n'/>"
      "<Field name='z' type='zlib' size='*'><Field name='t' type='bytes' size='w.m'/></Field>"
      "</Field></Reply></Command></Family></CommandDefinition>";
  ASSERT_EQ(Load(inner), 1) << Error().text;
  test::TempFolder folder;
  handset().LoadCommands(folder.Add("inner.xml", inner));
  for (const auto& [path, value] : {std::pair("I.g.l[0]", "7"), {"I.g.l[1]", "8"}, {"I.g.z.t", "abc"}}) {
    handset().defined().Set(path, value);
  }
  EXPECT_EQ(Call("I.C", ""), R"({"n":2,"w":{"m":3},"g":{"l":[7,8],"z":{"t":"616263"}}})") << Error().text;
  LoadExample();
  handset().defined().Set("WLAN.status", "3");
  EXPECT_EQ(Call("WLAN.SET_TABLE", ""), "the handset refused WLAN.SET_TABLE: status is 3");
}

TEST_F(DefinedCommands, PreparedCallsAreSetByIndexAndSentOften) {
  LoadExample();
  uint32_t call = 0;
  ASSERT_EQ(KRAL_CMD_Prepare(handle(), "WLAN.TX_START", &call), 1);
  ASSERT_EQ(KRAL_CMD_ClearDefinitions(handle()), 1);
  uint32_t channel = 9;
  uint32_t power = 9;
  ASSERT_EQ(KRAL_CMD_GetFieldIndex(handle(), call, 0, "channel", &channel), 1);
  ASSERT_EQ(KRAL_CMD_GetFieldIndex(handle(), call, 1, "power", &power), 1);
  EXPECT_EQ(KRAL_CMD_GetFieldIndex(handle(), call, 1, "channel", &channel), 0);
  ASSERT_EQ(KRAL_CMD_SetFields(handle(), call, "flags.antenna=1 rate=1M"), 1);
  for (int64_t i = 1; i <= 14; ++i) {
    const std::string number = HexText(std::array<uint8_t, 1>{static_cast<uint8_t>(i)});
    handset()
        .Expect("4B 0B 16 00 05 00 " + number + " 00 11 00")
        .Reply("4B 0B 16 00 05 00 00 00 00 00 00 C" + number.substr(1));
    ASSERT_EQ(i % 2 == 0 ? KRAL_CMD_SetInteger(handle(), call, channel, 0, i)
                         : KRAL_CMD_SetReal(handle(), call, channel, 0, static_cast<double>(i)),
              1);
    ASSERT_EQ(KRAL_CMD_Send(handle(), call), 1) << Error().text;
    double value = 0;
    EXPECT_EQ(KRAL_CMD_GetReal(handle(), call, power, 0, &value), 1);
    EXPECT_LT(value, 0);
    int64_t status = 9;
    EXPECT_EQ(KRAL_CMD_GetInteger(handle(), call, 0, 0, &status), 1);
    EXPECT_EQ(status, 0);
  }
  const size_t before = Traffic();
  const test::FailureRow kRows[] = {
      {"KRAL_CMD_SetInteger ARGUMENT", "channel=15 is out of range: 1 to 14",
       [&] { return KRAL_CMD_SetInteger(handle(), call, channel, 0, 15); }},
      {"KRAL_CMD_SetInteger ARGUMENT", "channel=-1 is out",
       [&] { return KRAL_CMD_SetInteger(handle(), call, channel, 0, -1); }},
      {"KRAL_CMD_SetReal ARGUMENT", "is out of range",
       [&] { return KRAL_CMD_SetReal(handle(), call, channel, 0, 1.5); }},
      {"KRAL_CMD_SetReal ARGUMENT", "is out of range",
       [&] { return KRAL_CMD_SetReal(handle(), call, channel, 0, std::nan("")); }},
      {"KRAL_CMD_SetInteger ARGUMENT", "1 elements",
       [&] { return KRAL_CMD_SetInteger(handle(), call, channel, 1, 1); }},
      {"KRAL_CMD_SetInteger ARGUMENT", "no field", [&] { return KRAL_CMD_SetInteger(handle(), call, 99, 0, 1); }},
      {"KRAL_CMD_SetBytes ARGUMENT", "is u8",
       [&] { return KRAL_CMD_SetBytes(handle(), call, channel, 0, nullptr, 0); }},
      {"KRAL_CMD_SetFields ARGUMENT", "speed", [&] { return KRAL_CMD_SetFields(handle(), call, "channel=3 speed=1"); }},
  };
  test::ExpectFailures(handle(), {std::begin(kRows), std::end(kRows)});
  handset().Expect("4B 0B 16 00 05 00 0E 00 11 00").Reply("4B 0B 16 00 05 00 07 00 00 00 00 00");  // as it was
  EXPECT_EQ(KRAL_CMD_Send(handle(), call), 0);
  EXPECT_EQ(Error().status, 7u);
  EXPECT_EQ(Error().status_kind, uint32_t{KRAL_ERROR_STATUS_COMMAND});
  int64_t status = 9;
  EXPECT_EQ(KRAL_CMD_GetInteger(handle(), call, 0, 0, &status), 0) << "a reply that was refused is none";
  EXPECT_EQ(KRAL_CMD_ClearField(handle(), call, channel), 1);
  EXPECT_EQ(KRAL_CMD_Send(handle(), call), 0) << "without a channel";
  EXPECT_EQ(Traffic(), before + 1);
  EXPECT_EQ(KRAL_CMD_Release(handle(), call), 1);
  EXPECT_EQ(KRAL_CMD_Send(handle(), call), 0);
}

TEST_F(DefinedCommands, BytesAreHeldToTheDefinitionAndNothingIsSentTwiceForRoom) {
  LoadExample();
  const auto request = FromHex("06 03 01 00");
  const auto wrong = FromHex("0F 03 01 00");
  std::array<uint8_t, 16> reply{};
  uint32_t size = reply.size();
  EXPECT_EQ(KRAL_CMD_CallBytes(handle(), "WLAN.TX_START", wrong.data(), 4, reply.data(), &size), 0);
  EXPECT_NE(std::string(Error().text).find("channel=15 is out of range"), std::string::npos) << Error().text;
  EXPECT_EQ(KRAL_CMD_CallBytes(handle(), "WLAN.TX_START", request.data(), 3, reply.data(), &size), 0);
  handset().Expect("4B 0B 16 00 05 00 06 03 01 00").Reply("4B 0B 16 00 05 00 00 00 00 00 48 C1");
  EXPECT_EQ(KRAL_CMD_CallBytes(handle(), "WLAN.TX_START", request.data(), 4, reply.data(), &size), 1) << Error().text;
  EXPECT_EQ(HexText(ByteView(reply).first(size)), "00 00 00 00 48 C1");
  std::array<char, 64> text{};
  handset().Expect("4B ...").Reply("4B 0B 16 00 05 00 00 00 00 00 48 41");
  EXPECT_EQ(KRAL_CMD_Call(handle(), "WLAN.TX_START", "channel=6", text.data(), 10), 0);
  EXPECT_EQ(text[0], '\0');
  EXPECT_EQ(KRAL_CMD_GetReply(handle(), text.data(), text.size()), 1);
  EXPECT_STREQ(text.data(), R"({"status":0,"power":12.5})");

  ASSERT_EQ(Load(WithRequest("<Field name='b' type='bytes' size='*'/>")), 1) << Error().text;
  const std::vector<uint8_t> too_long(CDiagPacket::kCapacity - 1);  // and the code in front of it
  const size_t before = Traffic();
  size = reply.size();
  EXPECT_EQ(
      KRAL_CMD_CallBytes(handle(), "F.C", too_long.data(), static_cast<uint32_t>(too_long.size()), reply.data(), &size),
      0);
  EXPECT_EQ(Error().code, uint32_t{KRAL_ERROR_ARGUMENT});
  EXPECT_EQ(Traffic(), before);
}

TEST_F(DefinedCommands, TheRfFileSendsWhatTheExportedFunctionsSend) {
  ASSERT_EQ(KRAL_CMD_LoadDefinitions(handle(), KRAL_SHARED_FILES "/commands/rf.xml", nullptr), 1) << Error().text;
  ASSERT_EQ(Count(), KRAL_FTM_GetCommandCount());
  const auto expect_same = [&](const std::string& name, const char* fields, const std::function<uint8_t()>& function) {
    for (const uint16_t code : {uint16_t{75}, uint16_t{59}}) {
      SCOPED_TRACE(name + " under " + std::to_string(code));
      KRAL_FTM_SET_COMMAND_CODE(handle(), code);
      KRAL_FTM_SET_MODE_ID(handle(), KRAL_FTM_MODE_ID_GSM);
      ASSERT_EQ(function(), 1);
      const std::string request = LastRequest();
      KRAL_FTM_SET_MODE_ID(handle(), KRAL_FTM_MODE_ID_GSM);
      ASSERT_EQ(KRAL_CMD_Call(handle(), ("RF." + name).c_str(), fields, nullptr, 0), 1) << Error().text;
      EXPECT_EQ(LastRequest(), request);
    }
  };
  expect_same("SET_TX_ON", "", [&] { return KRAL_FTM_SET_TX_ON(handle()); });
  expect_same("SET_TX_OFF", "", [&] { return KRAL_FTM_SET_TX_OFF(handle()); });
  expect_same("SET_MODE", "rf_mode=9", [&] { return KRAL_FTM_SET_MODE(handle(), 9); });
  expect_same("SET_CHAN", "channel=1013", [&] { return KRAL_FTM_SET_CHAN(handle(), 1013); });
  const std::array<uint8_t, 3> payload{0xA1, 0xB2, 0xC3};
  for (const test::FtmCommandRow& row : test::kFtmCommandRows) {
    expect_same(std::string(row.name).substr(std::strlen("KRAL_FTM_")), "payload=A1B2C3", [&] {
      std::array<uint8_t, 8> response{};
      uint16_t size = response.size();
      return row.function(handle(), payload.data(), payload.size(), response.data(), &size);
    });
  }
  EXPECT_EQ(KRAL_CMD_Call(handle(), "RF.SET_MODE", "rf_mode=13", nullptr, 0), 0) << "a mode of no group";
}

}  // namespace
}  // namespace kral
