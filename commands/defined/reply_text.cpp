// Writes values and definitions; the form of JSON is json_text.cpp's.
#include "commands/defined/reply_text.h"

#include <array>
#include <bit>
#include <cmath>

#include "commands/defined/json_text.h"

namespace kral::defined {
namespace {

std::string HexDigits(std::string_view bytes) {
  constexpr std::string_view kDigits = "0123456789ABCDEF";
  std::string text;
  text.reserve(2 * bytes.size());
  for (const char byte : bytes) {
    text += kDigits[static_cast<uint8_t>(byte) >> 4];
    text += kDigits[static_cast<uint8_t>(byte) & 15];
  }
  return text;
}

// A number as it stands in JSON, which knows no infinities.
void WriteNumber(JsonText& json, const Field& field, Bits value) {
  if (const std::string* const word = field.enumeration ? field.enumeration->NameOf(value) : nullptr) {
    json.Text(*word);
  } else if (field.kind == Kind::kReal && !std::isfinite(std::bit_cast<double>(value))) {
    json.Raw("null");
  } else {
    json.Raw(NumberText(field, value));
  }
}

class ReplyWriter {
 public:
  explicit ReplyWriter(const Values& values) : values_(values) {}

  std::string Run() {
    Group(values_.message().fields, 0);
    return json_.text();
  }

 private:
  void Group(const std::vector<Field>& fields, uint32_t depth) {
    json_.Begin('{');
    for (const Field& field : fields) {
      if (field.condition && !IsThere(*field.condition, values_, elements_)) continue;
      json_.Name(field.name);
      const uint32_t first = elements_[depth] * field.count.most;
      if (!field.is_array) {
        One(field, first);
        continue;
      }
      json_.Begin('[');
      const uint32_t count = CountOf(field, first);
      for (uint32_t i = 0; i < count; ++i) One(field, first + i);
      json_.End(']');
    }
    json_.End('}');
  }

  uint32_t CountOf(const Field& field, uint32_t first) const {
    if (field.count.rule == Extent::Rule::kToEnd) return Reach(values_, field, first, field.count.most);
    if (field.count.rule != Extent::Rule::kCounted) return field.count.most;
    const Reference& reference = field.count.counted_by;
    return static_cast<uint32_t>(*values_.Number(reference.slot, elements_[reference.depth]));
  }

  void One(const Field& field, uint32_t element) {
    if (field.is_group()) {
      elements_[field.depth + 1] = element;
      return Group(field.members, field.depth + 1);
    }
    if (field.is_number()) return WriteNumber(json_, field, *values_.Number(field.slot, element));
    const std::string& bytes = *values_.Bytes(field.slot, element);
    json_.Text(field.kind == Kind::kText ? bytes : HexDigits(bytes));
  }

  const Values& values_;
  Elements elements_{};
  JsonText json_;
};

// --- Definitions ----------------------------------------------------------------------------------------------------

void WriteExtent(JsonText& json, const char* name, const char* most_name, const Extent& extent) {
  json.Name(name);
  switch (extent.rule) {
    case Extent::Rule::kFixed:
      json.Raw(std::to_string(extent.most));
      return;
    case Extent::Rule::kCounted:
      json.Text(extent.counted_by.name);
      break;
    case Extent::Rule::kToEnd:
      json.Text("*");
      break;
    case Extent::Rule::kTerminated:
      json.Text("terminated");
      break;
  }
  json.Name(most_name).Raw(std::to_string(extent.most));
}

void WriteOptional(JsonText& json, const char* name, const Field& field, const std::optional<Bits>& value) {
  if (!value) return;
  json.Name(name);
  WriteNumber(json, field, *value);
}

void WriteNumberLimits(JsonText& json, const Field& field) {
  json.Name("range").Text(RangeText(field));
  WriteOptional(json, "min", field, field.least);
  WriteOptional(json, "max", field, field.most);
  WriteOptional(json, "default", field, field.preset);
  if (field.enumeration) {
    json.Name("enum").Begin('{');
    for (const auto& [word, value] : field.enumeration->values) json.Name(word).Raw(NumberText(field, value));
    json.End('}');
  }
  if (!field.is_status()) return;
  json.Name("success").Begin('[');
  for (const Bits value : field.success) json.Raw(NumberText(field, value));
  json.End(']');
}

void WriteFields(JsonText& json, const std::vector<Field>& fields);

void WriteField(JsonText& json, const Field& field) {
  json.Begin('{').Member("name", field.name).Member("type", TypeText(field));
  json.Member("unit", field.unit).Member("doc", field.documentation);
  if (field.big_endian) json.Member("order", "big");
  if (field.is_array) WriteExtent(json, "count", "max_count", field.count);
  if (field.kind == Kind::kText || field.kind == Kind::kBytes || field.kind == Kind::kPacked) {
    WriteExtent(json, "size", "max_size", field.size);
  }
  if (field.is_number()) WriteNumberLimits(json, field);
  if (field.preset_bytes) json.Name("default").Text(*field.preset_bytes);
  if (field.bit_count != 0) json.Name("first_bit").Raw(std::to_string(field.first_bit));
  if (field.condition) {
    json.Name("when").Begin('{').Member("field", field.condition->on.name);
    json.Name(field.condition->is_not ? "is_not" : "is").Begin('[');
    for (const Bits value : field.condition->values) json.Raw(std::to_string(static_cast<int64_t>(value)));
    json.End(']').End('}');
  }
  if (field.is_group()) {
    json.Name("fields");
    WriteFields(json, field.members);
  } else {
    json.Name("index").Raw(std::to_string(field.slot));
  }
  json.End('}');
}

void WriteFields(JsonText& json, const std::vector<Field>& fields) {
  json.Begin('[');
  for (const Field& field : fields) WriteField(json, field);
  json.End(']');
}

void WriteFraming(JsonText& json, const Framing& framing) {
  constexpr std::array<const char*, 4> kFrames = {"ftm", "ftm59", "diag", "subsystem"};
  json.Member("frame", kFrames[static_cast<size_t>(framing.frame)]);
  if (framing.frame == Frame::kSubsystem) json.Name("subsystem").Raw(std::to_string(framing.subsystem));
  if (framing.frame != Frame::kFtm) return;
  json.Name("mode");
  if (framing.mode_rule == ModeRule::kFixed) {
    json.Raw(std::to_string(framing.mode_id));
  } else {
    json.Text(framing.mode_rule == ModeRule::kCurrent ? "current" : "by_rf_mode");
  }
}

}  // namespace

std::string ReplyText(const Values& values) {
  return ReplyWriter(values).Run();
}

std::string DescriptionText(const Command& command) {
  JsonText json;
  json.Begin('{').Member("name", command.name).Name("id").Raw(std::to_string(command.id));
  json.Member("doc", command.documentation);
  WriteFraming(json, command.framing);
  json.Name("request");
  WriteFields(json, command.request.fields);
  json.Name("reply");
  WriteFields(json, command.reply.fields);
  return json.End('}').text();
}

}  // namespace kral::defined
