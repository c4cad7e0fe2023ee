// A definition file, a zero byte and a reply; or a reply alone, of a definition that has every kind of field. What can
// be read can be sent again, and then says the same.
#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "commands/defined/definition_xml.h"
#include "commands/defined/reply_text.h"
#include "fuzz/support.h"

namespace {

using namespace kral;
using fuzz::Require;
using namespace kral::defined;

constexpr size_t kMostCommands = 32;  // are looked at

constexpr std::string_view kEveryKind = R"(<CommandDefinition>
  <Enumeration name="E"><Value name="one" value="1"/></Enumeration>
  <Record name="R"><Field name="k" type="u8" enum="E"/><Field name="v" type="s16" count="k" max_count="3"/>
    <Field name="t" type="text" size="terminated" max_size="9" when="k!=one"/></Record>
  <Family name="F" frame="diag"><Command name="C" id="200"><Request/><Reply>
    <Field name="status" type="u8" success="0,1"/><Field name="n" type="u8"/><Field name="m" type="u16" order="big"/>
    <Field name="w" type="u32"><Bit name="low" bits="0-6" signed="1"/><Bit name="top" bits="31"/></Field>
    <Field name="f" type="f32"/><Field name="d" type="f64" when="status=1"/>
    <Field name="rows" type="R" count="n"/><Field name="label" type="text" size="4"/>
    <Field name="packed" type="zlib" size="m"><Field name="rows" type="R" count="*"/></Field>
    <Field name="rest" type="bytes" size="*"/></Reply></Command></Family></CommandDefinition>)";

bool Read(const Message& message, std::span<const uint8_t> bytes, Values& values) {
  try {
    Decode(bytes, values, true);
    return values.message().slots.size() == message.slots.size();
  } catch (const BadCall&) {
    return false;
  } catch (const RefusedByStatus&) {
    return false;
  }
}

void TakeReply(const Message& message, std::span<const uint8_t> bytes) {
  Values values(message);
  if (!Read(message, bytes, values)) return;
  const std::string text = ReplyText(values);
  std::vector<uint8_t> again;
  try {
    again = Encode(values);
  } catch (const BadCall&) {
    return;  // a stream of zlib's comes back with another length
  }
  Values read(message);
  Require(Read(message, again, read));
  Require(ReplyText(read) == text);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::span<const uint8_t> document(reinterpret_cast<const uint8_t*>(kEveryKind.data()), kEveryKind.size());
  std::span<const uint8_t> reply(data, size);
  if (size > 0 && data[0] == '<') {
    const auto* const end = std::find(data, data + size, uint8_t{0});
    document = {data, end};
    reply = {std::min(end + 1, data + size), data + size};
  }
  std::vector<CommandPtr> commands;
  Problem problem;
  if (!ReadDefinitions(document, {}, commands, problem)) {
    Require(!problem.text.empty());
    return 0;
  }
  for (size_t i = 0; i < commands.size() && i < kMostCommands; ++i) {
    Require(!DescriptionText(*commands[i]).empty());
    TakeReply(commands[i]->reply, reply);
    TakeReply(commands[i]->request, reply);
  }
  return 0;
}
