// Exports of commands by definition: what callers may pass, and the outputs.
#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>
#include <string>

#include "base/outputs.h"
#include "base/text_argument.h"
#include "base/utf8_text.h"
#include "commands/defined/call.h"
#include "commands/defined/reply_text.h"
#include "frame/export_call.h"
#include "kral/cmd.h"

namespace {

using kral::Diag_FTM;
using kral::ExportCall;
using kral::Fail;
using kral::Failure;
using kral::kNoFileName;
using kral::Put;
using kral::TextOrEmpty;
namespace defined = kral::defined;
using defined::Bits;
using defined::Call;
using defined::Field;
using defined::Kind;

static_assert(sizeof(KRAL_CMD_FIELD) == 448);
static_assert(sizeof(KRAL_CMD_COMMAND) == 256);
static_assert(KRAL_CMD_FRAME_SUBSYSTEM == static_cast<uint32_t>(defined::Frame::kSubsystem));
static_assert(KRAL_CMD_KIND_ZLIB == static_cast<uint32_t>(Kind::kPacked));
static_assert(KRAL_CMD_NO_INDEX == defined::kNoSlot);

constexpr const char* kNoRecord = "there is no record, or its size is too small";
constexpr const char* kNoOutput = "there is no place for the result";

bool Refused(const char* what) {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", what));
}

// Runs operation(phone, call) on a prepared call.
template <class Operation>
uint8_t OnCall(KRAL_HANDLE handle, const char* function, uint32_t number, Operation&& operation) {
  return ExportCall(handle, function).Run([&](Diag_FTM& phone) {
    const auto call = defined::FindCall(phone, number);
    return call && operation(phone, call);
  });
}

// Runs operation(values, field) on a field of a prepared call's request. What it throws is refused.
template <class Operation>
uint8_t OnRequestField(KRAL_HANDLE handle, const char* function, uint32_t number, uint32_t index, uint32_t element,
                       Operation&& operation) {
  return OnCall(handle, function, number, [&](Diag_FTM&, const std::shared_ptr<Call>& call) {
    const auto& slots = call->command->request.slots;
    if (index >= slots.size()) return Refused("the request has no field of that index");
    const Field& field = *slots[index];
    if (element >= field.capacity) {
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s has %u elements at most", field.path.c_str(), field.capacity));
    }
    try {
      return operation(call->request, field);
    } catch (const defined::BadCall& bad) {
      return Refused(bad.what());
    }
  });
}

// Runs operation(values, field) on a field of a prepared call's reply.
template <class Operation>
uint8_t OnReplyField(KRAL_HANDLE handle, const char* function, uint32_t number, uint32_t index, Operation&& operation) {
  return OnCall(handle, function, number, [&](Diag_FTM&, const std::shared_ptr<Call>& call) {
    const auto& slots = call->command->reply.slots;
    if (index >= slots.size()) return Refused("the reply has no field of that index");
    if (!call->answered) return Refused("the call has no reply: its last one failed, or it was not sent yet");
    return operation(call->reply, *slots[index]);
  });
}

bool NoSuchElement(const Field& field, uint32_t element) {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "the reply has no element %u of %s", element, field.path.c_str()));
}

bool WrongKind(const Field& field, const char* wanted) {
  return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s is %s, and not %s", field.path.c_str(), defined::TypeText(field).c_str(),
                      wanted));
}

bool GiveText(const std::string& text, char* output, uint32_t size) {
  if (output == nullptr) return Refused(kNoOutput);
  if (text.size() >= size) {
    return Fail(
        Failure(KRAL_ERROR_ARGUMENT, "the text needs %zu bytes, and there is room for %u", text.size() + 1, size));
  }
  std::copy_n(text.c_str(), text.size() + 1, output);
  return true;
}

bool GiveBytes(std::span<const uint8_t> bytes, uint8_t* output, uint32_t* size) {
  if (bytes.size() > *size) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "there are %zu bytes, and there is room for %u", bytes.size(), *size));
  }
  std::ranges::copy(bytes, output);
  *size = static_cast<uint32_t>(bytes.size());
  return true;
}

// --- Fields as records ----------------------------------------------------------------------------------------------

// Field `number` of a tree, groups in front of their fields.
const Field* FieldAt(const std::vector<Field>& fields, uint32_t& number) {
  for (const Field& field : fields) {
    if (number-- == 0) return &field;
    if (const Field* const found = FieldAt(field.members, number)) return found;
  }
  return nullptr;
}

double RealOf(const Field& field, Bits value) {
  if (field.kind == Kind::kReal) return std::bit_cast<double>(value);
  return field.kind == Kind::kSigned ? static_cast<double>(static_cast<int64_t>(value)) : static_cast<double>(value);
}

template <size_t kSize>
void CopyText(const std::string& text, char (&output)[kSize]) {
  std::copy_n(text.c_str(), std::min(text.size(), kSize - 1), output);
  kral::MakePrintableUtf8(output);
}

uint32_t FlagsOf(const Field& field) {
  const bool sized = field.kind == Kind::kText || field.kind == Kind::kBytes || field.kind == Kind::kPacked;
  const auto is_fixed = [](const defined::Extent& extent) { return extent.rule == defined::Extent::Rule::kFixed; };
  uint32_t flags = 0;
  if (field.is_array) flags |= KRAL_CMD_FIELD_ARRAY;
  if (!is_fixed(field.count) || (sized && !is_fixed(field.size))) flags |= KRAL_CMD_FIELD_VARIABLE;
  if (field.condition) flags |= KRAL_CMD_FIELD_CONDITIONAL;
  if (field.is_status()) flags |= KRAL_CMD_FIELD_STATUS;
  if (field.preset || field.preset_bytes) flags |= KRAL_CMD_FIELD_DEFAULT;
  if (field.enumeration) flags |= KRAL_CMD_FIELD_WORDS;
  if (field.counts) flags |= KRAL_CMD_FIELD_COUNTS;
  return flags;
}

void FillRecord(const Field& field, KRAL_CMD_FIELD& record) {
  record = {};
  record.size = sizeof record;
  record.index = field.slot;
  record.kind = static_cast<uint32_t>(field.kind);
  record.bits = defined::BitCount(field);
  record.depth = field.depth;
  record.count = field.count.most;
  record.room = field.is_number() || field.kind == Kind::kRecord || field.kind == Kind::kBits ? 0 : field.size.most;
  record.flags = FlagsOf(field);
  if (field.is_number()) {
    const auto [least, most] = defined::RangeOf(field);
    record.least = RealOf(field, least);
    record.most = RealOf(field, most);
    record.preset = field.preset ? RealOf(field, *field.preset) : 0;
  }
  CopyText(field.name, record.name);
  CopyText(field.path, record.path);
  CopyText(field.unit, record.unit);
  CopyText(field.documentation, record.documentation);
}

uint32_t CountFields(const std::vector<Field>& fields) {
  auto count = static_cast<uint32_t>(fields.size());
  for (const Field& field : fields) count += CountFields(field.members);
  return count;
}

void FillRecord(const defined::Command& command, KRAL_CMD_COMMAND& record) {
  const defined::Framing& framing = command.framing;
  record = {};
  record.size = sizeof record;
  record.id = command.id;
  record.frame = static_cast<uint32_t>(framing.frame);
  record.mode_id = framing.mode_id;
  if (framing.mode_rule == defined::ModeRule::kCurrent) record.mode_id = KRAL_CMD_MODE_CURRENT;
  if (framing.mode_rule == defined::ModeRule::kByRfMode) record.mode_id = KRAL_CMD_MODE_BY_RF_MODE;
  record.subsystem = framing.subsystem;
  record.request_fields = CountFields(command.request.fields);
  record.reply_fields = CountFields(command.reply.fields);
  CopyText(command.documentation, record.documentation);
}

// --- Values ---------------------------------------------------------------------------------------------------------

// A real number for a field of whole ones.
Bits WholeBits(const Field& field, double value) {
  constexpr double kTwoTo63 = 9223372036854775808.0;
  const bool fits =
      field.kind == Kind::kSigned ? value >= -kTwoTo63 && value < kTwoTo63 : value >= 0 && value < 2 * kTwoTo63;
  if (!fits || value != std::floor(value)) {
    throw defined::BadCall(field.path + "=" + std::to_string(value) + " is out of range: " + defined::RangeText(field));
  }
  return field.kind == Kind::kSigned ? static_cast<Bits>(static_cast<int64_t>(value)) : static_cast<Bits>(value);
}

Bits BitsOfInteger(const Field& field, int64_t value) {
  if (field.kind == Kind::kReal) return std::bit_cast<Bits>(static_cast<double>(value));
  if (field.kind == Kind::kUnsigned && value < 0 && defined::BitCount(field) < 64) {
    throw defined::BadCall(field.path + "=" + std::to_string(value) + " is out of range: " + defined::RangeText(field));
  }
  return static_cast<Bits>(value);
}

bool SetFields(Call& call, const char* fields) {
  defined::Values values = call.request;  // with a fault nothing is set
  try {
    defined::Assign(TextOrEmpty(fields), values);
  } catch (const defined::BadCall& bad) {
    return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s: %s", call.command->name.c_str(), bad.what()));
  }
  call.request = std::move(values);
  return true;
}

bool CallText(Diag_FTM& phone, const char* command, const char* fields, char* reply, uint32_t size) {
  const auto found = defined::FindCommand(phone, TextOrEmpty(command));
  if (!found) return false;
  const auto call = std::make_shared<Call>(found);
  if (!SetFields(*call, fields) || !defined::Send(phone, call)) return false;
  return reply == nullptr || GiveText(defined::ReplyText(call->reply), reply, size);
}

bool CallBytes(Diag_FTM& phone, const char* command, std::span<const uint8_t> request, uint8_t* reply,
               uint32_t* reply_size) {
  const auto found = defined::FindCommand(phone, TextOrEmpty(command));
  std::span<const uint8_t> bytes;
  return found && defined::SendBytes(phone, std::make_shared<Call>(found), request, bytes) &&
         GiveBytes(bytes, reply, reply_size);
}

const Call* LastCall(Diag_FTM& phone) {
  const Call* const call = phone.state<defined::Session>().last_call.get();
  if (call == nullptr || !call->answered) {
    Refused("there is no reply: the last call failed, or none was made yet");
    return nullptr;
  }
  return call;
}

}  // namespace

extern "C" {

uint8_t KRAL_CALL KRAL_CMD_LoadDefinitions(KRAL_HANDLE handle, const char* file, uint32_t* commands) {
  return ExportCall(handle, __func__)
      .Logged("( %s )", TextOrEmpty(file))
      .Require(file != nullptr, kNoFileName)
      .Run([=](Diag_FTM& phone) {
        uint32_t count = 0;
        if (!defined::LoadDefinitions(phone, file, count)) return false;
        Put(commands, count);
        return true;
      });
}

uint8_t KRAL_CALL KRAL_CMD_ClearDefinitions(KRAL_HANDLE handle) {
  return ExportCall(handle, __func__).Run([](Diag_FTM& phone) {
    phone.state<defined::Session>().definitions.Clear();
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetCount(KRAL_HANDLE handle, uint32_t* count) {
  return ExportCall(handle, __func__).Require(count != nullptr, kNoOutput).Run([=](Diag_FTM& phone) {
    *count = static_cast<uint32_t>(phone.state<defined::Session>().definitions.count());
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetName(KRAL_HANDLE handle, uint32_t index, char* name, uint32_t size) {
  return ExportCall(handle, __func__).Run([=](Diag_FTM& phone) {
    const auto command = phone.state<defined::Session>().definitions.At(index);
    return command ? GiveText(command->name, name, size) : Refused("there is no command of that index");
  });
}

uint8_t KRAL_CALL KRAL_CMD_Describe(KRAL_HANDLE handle, const char* command, char* text, uint32_t size) {
  return ExportCall(handle, __func__).Run([=](Diag_FTM& phone) {
    const auto found = defined::FindCommand(phone, TextOrEmpty(command));
    return found && GiveText(defined::DescriptionText(*found), text, size);
  });
}

uint8_t KRAL_CALL KRAL_CMD_DescribeLength(KRAL_HANDLE handle, const char* command, uint32_t* length) {
  return ExportCall(handle, __func__).Require(length != nullptr, kNoOutput).Run([=](Diag_FTM& phone) {
    const auto found = defined::FindCommand(phone, TextOrEmpty(command));
    if (found) *length = static_cast<uint32_t>(defined::DescriptionText(*found).size() + 1);
    return found != nullptr;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetCommand(KRAL_HANDLE handle, const char* command, KRAL_CMD_COMMAND* record) {
  return ExportCall(handle, __func__)
      .Require(record != nullptr && record->size >= sizeof *record, kNoRecord)
      .Run([=](Diag_FTM& phone) {
        const auto found = defined::FindCommand(phone, TextOrEmpty(command));
        if (found) FillRecord(*found, *record);
        return found != nullptr;
      });
}

uint8_t KRAL_CALL KRAL_CMD_GetField(KRAL_HANDLE handle, const char* command, uint8_t of_reply, uint32_t number,
                                    KRAL_CMD_FIELD* field) {
  return ExportCall(handle, __func__)
      .Require(field != nullptr && field->size >= sizeof *field, kNoRecord)
      .Run([=](Diag_FTM& phone) {
        const auto found = defined::FindCommand(phone, TextOrEmpty(command));
        if (!found) return false;
        uint32_t left = number;
        const Field* const at = FieldAt(of_reply != 0 ? found->reply.fields : found->request.fields, left);
        if (at == nullptr) return Refused("there is no field of that number");
        FillRecord(*at, *field);
        return true;
      });
}

uint8_t KRAL_CALL KRAL_CMD_GetWord(KRAL_HANDLE handle, const char* command, uint8_t of_reply, uint32_t index,
                                   uint32_t number, char* word, uint32_t size, int64_t* value) {
  return ExportCall(handle, __func__).Require(value != nullptr, kNoOutput).Run([=](Diag_FTM& phone) {
    const auto found = defined::FindCommand(phone, TextOrEmpty(command));
    if (!found) return false;
    const auto& slots = of_reply != 0 ? found->reply.slots : found->request.slots;
    const auto* const words = index < slots.size() ? slots[index]->enumeration.get() : nullptr;
    if (words == nullptr || number >= words->values.size()) return Refused("there is no such word");
    if (!GiveText(words->values[number].first, word, size)) return false;
    *value = static_cast<int64_t>(words->values[number].second);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_Call(KRAL_HANDLE handle, const char* command, const char* fields, char* reply,
                                uint32_t size) {
  return ExportCall(handle, __func__)
      .Logged("( %s, %s )", TextOrEmpty(command), TextOrEmpty(fields))
      .Run(CallText, command, fields, reply, size);
}

uint8_t KRAL_CALL KRAL_CMD_CallBytes(KRAL_HANDLE handle, const char* command, const uint8_t* request,
                                     uint32_t request_size, uint8_t* reply, uint32_t* reply_size) {
  return ExportCall(handle, __func__)
      .Logged("( %s, request_size = %u )", TextOrEmpty(command), request_size)
      .Require((request != nullptr || request_size == 0) && reply != nullptr && reply_size != nullptr,
               "the request or the room for the reply is missing")
      .Run(CallBytes, command, std::span(request, request_size), reply, reply_size);
}

uint8_t KRAL_CALL KRAL_CMD_GetReply(KRAL_HANDLE handle, char* reply, uint32_t size) {
  return ExportCall(handle, __func__).Run([=](Diag_FTM& phone) {
    const Call* const call = LastCall(phone);
    return call != nullptr && GiveText(defined::ReplyText(call->reply), reply, size);
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetReplyLength(KRAL_HANDLE handle, uint32_t* length) {
  return ExportCall(handle, __func__).Require(length != nullptr, kNoOutput).Run([=](Diag_FTM& phone) {
    const Call* const call = LastCall(phone);
    if (call != nullptr) *length = static_cast<uint32_t>(defined::ReplyText(call->reply).size() + 1);
    return call != nullptr;
  });
}

uint8_t KRAL_CALL KRAL_CMD_Prepare(KRAL_HANDLE handle, const char* command, uint32_t* call) {
  return ExportCall(handle, __func__)
      .Logged("( %s )", TextOrEmpty(command))
      .Require(call != nullptr, kNoOutput)
      .Run([=](Diag_FTM& phone) { return defined::Prepare(phone, TextOrEmpty(command), *call); });
}

uint8_t KRAL_CALL KRAL_CMD_Release(KRAL_HANDLE handle, uint32_t call) {
  return OnCall(handle, __func__, call, [=](Diag_FTM& phone, const std::shared_ptr<Call>&) {
    return phone.state<defined::Session>().prepared.erase(call) != 0;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetFieldIndex(KRAL_HANDLE handle, uint32_t call, uint8_t of_reply, const char* path,
                                         uint32_t* index) {
  return OnCall(handle, __func__, call, [=](Diag_FTM&, const std::shared_ptr<Call>& found) {
    if (index == nullptr) return Refused(kNoOutput);
    const auto& message = of_reply != 0 ? found->command->reply : found->command->request;
    const Field* const field = defined::FindSlot(message, TextOrEmpty(path));
    if (field == nullptr) {
      return Fail(Failure(KRAL_ERROR_ARGUMENT, "%s has no field %.100s with a value", found->command->name.c_str(),
                          TextOrEmpty(path)));
    }
    *index = field->slot;
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_SetFields(KRAL_HANDLE handle, uint32_t call, const char* fields) {
  return OnCall(handle, __func__, call,
                [=](Diag_FTM&, const std::shared_ptr<Call>& found) { return SetFields(*found, fields); });
}

uint8_t KRAL_CALL KRAL_CMD_SetInteger(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                      int64_t value) {
  return OnRequestField(handle, __func__, call, index, element, [=](defined::Values& values, const Field& field) {
    if (!field.is_number()) return WrongKind(field, "a number");
    SetChecked(values, field, element, BitsOfInteger(field, value));
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_SetReal(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element, double value) {
  return OnRequestField(handle, __func__, call, index, element, [=](defined::Values& values, const Field& field) {
    if (!field.is_number()) return WrongKind(field, "a number");
    SetChecked(values, field, element,
               field.kind == Kind::kReal ? std::bit_cast<Bits>(value) : WholeBits(field, value));
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_SetBytes(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                    const uint8_t* bytes, uint32_t size) {
  return OnRequestField(handle, __func__, call, index, element, [=](defined::Values& values, const Field& field) {
    if (field.is_number()) return WrongKind(field, "a text or a block");
    if (bytes == nullptr && size != 0) return Refused("there are no bytes");
    SetChecked(values, field, element, std::string(reinterpret_cast<const char*>(bytes), size));
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_ClearField(KRAL_HANDLE handle, uint32_t call, uint32_t index) {
  return OnRequestField(handle, __func__, call, index, 0, [](defined::Values& values, const Field& field) {
    values.Clear(field.slot);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_Send(KRAL_HANDLE handle, uint32_t call) {
  return OnCall(handle, __func__, call, defined::Send);
}

uint8_t KRAL_CALL KRAL_CMD_GetElements(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t* count) {
  return OnReplyField(handle, __func__, call, index, [=](const defined::Values& values, const Field& field) {
    if (count == nullptr) return Refused(kNoOutput);
    *count = values.Reach(field.slot, 0, field.capacity);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetInteger(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element,
                                      int64_t* value) {
  return OnReplyField(handle, __func__, call, index, [=](const defined::Values& values, const Field& field) {
    if (value == nullptr) return Refused(kNoOutput);
    if (field.kind != Kind::kUnsigned && field.kind != Kind::kSigned) return WrongKind(field, "a whole number");
    const Bits* const bits = values.Number(field.slot, element);
    if (bits == nullptr) return NoSuchElement(field, element);
    *value = static_cast<int64_t>(*bits);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetReal(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element, double* value) {
  return OnReplyField(handle, __func__, call, index, [=](const defined::Values& values, const Field& field) {
    if (value == nullptr) return Refused(kNoOutput);
    if (!field.is_number()) return WrongKind(field, "a number");
    const Bits* const bits = values.Number(field.slot, element);
    if (bits == nullptr) return NoSuchElement(field, element);
    *value = RealOf(field, *bits);
    return true;
  });
}

uint8_t KRAL_CALL KRAL_CMD_GetBytes(KRAL_HANDLE handle, uint32_t call, uint32_t index, uint32_t element, uint8_t* bytes,
                                    uint32_t* size) {
  return OnReplyField(handle, __func__, call, index, [=](const defined::Values& values, const Field& field) {
    if (bytes == nullptr || size == nullptr) return Refused(kNoOutput);
    if (field.is_number()) return WrongKind(field, "a text or a block");
    const std::string* const text = values.Bytes(field.slot, element);
    if (text == nullptr) return NoSuchElement(field, element);
    return GiveBytes({reinterpret_cast<const uint8_t*>(text->data()), text->size()}, bytes, size);
  });
}

}  // extern "C"
