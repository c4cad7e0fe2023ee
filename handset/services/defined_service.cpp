// Reads definition files, as far as a handset needs them, and answers their commands. Whether a file contradicts itself
// is left to others.
#include "handset/services/defined_service.h"

#include <cstdlib>
#include <stdexcept>
#include <utility>

#include "handset/services/defined_check.h"
#include "handset/services/defined_codec.h"
#include "platform/file_util.h"
#include "platform/xml_document.h"

namespace kral::handset {
namespace {

constexpr uint32_t kPlainCode = 0x01000000;  // behind no subsystem
constexpr int kDeepest = 16;

std::string Text(const XmlElement& element, const char* name) {
  const std::string* const text = element.Attribute(name);
  return text != nullptr ? *text : std::string();
}

uint32_t Number(const XmlElement& element, const char* name) {
  const std::string text = Text(element, name);
  if (text.empty() || text.find_first_not_of("0123456789") != std::string::npos) {
    throw std::invalid_argument("<" + element.name + "> has no number " + name);
  }
  return static_cast<uint32_t>(std::strtoul(text.c_str(), nullptr, 10));
}

class Reader {
 public:
  explicit Reader(const XmlElement& root) : root_(root) {}

  std::vector<DefinedField> Fields(const XmlElement& group, int depth = 0) {
    if (depth > kDeepest) throw std::invalid_argument("groups are nested too deeply");
    std::vector<DefinedField> fields;
    for (const XmlElement& element : group.children) fields.push_back(OneField(element, depth));
    return fields;
  }

  bool big = false;  // of fields that do not say

 private:
  const XmlElement* Shared(const char* kind, const std::string& name) const {
    for (const XmlElement& element : root_.children) {
      if (element.name == kind && Text(element, "name") == name) return &element;
    }
    return nullptr;
  }

  // "11M" is 3 where the enumeration says so; lists and "field=11M" alike.
  static std::string Plain(const DefinedField& field, const std::string& text) {
    const auto word = field.words.find(text);
    return word != field.words.end() ? word->second : text;
  }

  DefinedField OneField(const XmlElement& element, int depth) {
    DefinedField field;
    field.name = Text(element, "name");
    field.type = Text(element, "type");
    field.count = Text(element, "count");
    field.size = Text(element, "size");
    if (element.Attribute("max_count") != nullptr) field.most_elements = Number(element, "max_count");
    if (element.Attribute("max_size") != nullptr) field.most_bytes = Number(element, "max_size");
    field.when = Text(element, "when");
    field.big = element.Attribute("order") != nullptr ? Text(element, "order") == "big" : big;
    if (element.name == "Bit") field.type = Text(element, "signed") == "1" ? "s" : "u";
    if (const XmlElement* const words = Shared("Enumeration", Text(element, "enum"))) {
      for (const XmlElement& value : words->children) field.words[Text(value, "name")] = Text(value, "value");
    }
    field.preset = Plain(field, Text(element, "default"));
    field.success = Plain(field, Text(element, "success"));
    if (element.Attribute("min") != nullptr) field.least = std::strtod(Text(element, "min").c_str(), nullptr);
    if (element.Attribute("max") != nullptr) field.most = std::strtod(Text(element, "max").c_str(), nullptr);
    Shape(element, field, depth);
    return field;
  }

  void Shape(const XmlElement& element, DefinedField& field, int depth) {
    if (element.name == "Bit") {
      const std::string bits = Text(element, "bits");
      const size_t dash = bits.find('-');
      field.first_bit = static_cast<unsigned>(std::strtoul(bits.c_str(), nullptr, 10));
      const std::string last = dash == std::string::npos ? bits : bits.substr(dash + 1);
      field.bits = static_cast<unsigned>(std::strtoul(last.c_str(), nullptr, 10)) - field.first_bit + 1;
    } else if (const XmlElement* const record = Shared("Record", field.type)) {
      field.type = "record";
      field.fields = Fields(*record, depth + 1);
    } else if (field.type == "record" || field.type == "zlib") {
      field.fields = Fields(element, depth + 1);
    } else if (field.type.size() > 1 && field.type.find_first_of("123456789") == 1) {
      field.bits = static_cast<unsigned>(std::strtoul(field.type.c_str() + 1, nullptr, 10));
      field.width = field.bits / 8;
      field.fields = Fields(element, depth + 1);
      if (!field.fields.empty()) field.type = "bits";
    } else if (field.type != "text" && field.type != "bytes") {
      throw std::invalid_argument(field.name + ": there is no type " + field.type);
    }
    if (field.bits > 64) throw std::invalid_argument(field.name + " has more than 64 bits");
  }

  const XmlElement& root_;
};

// Conditions look at numbers: words stand for them.
void ResolveWords(std::vector<DefinedField>& fields) {
  for (DefinedField& field : fields) {
    ResolveWords(field.fields);
    const size_t equals = field.when.find('=');
    if (equals == std::string::npos || equals == 0) continue;
    const std::string name = field.when.substr(0, equals - (field.when[equals - 1] == '!' ? 1 : 0));
    for (const DefinedField& other : fields) {
      const auto word = other.words.find(field.when.substr(equals + 1));
      if (other.name == name && word != other.words.end()) field.when = field.when.substr(0, equals + 1) + word->second;
    }
  }
}

std::string FamilyOf(const std::string& path) {
  return path.substr(0, path.find('.') + 1);
}

}  // namespace

void DefinedService::Load(const std::string& path, FtmService& ftm) {
  XmlElement root;
  std::string problem;
  if (LoadXml(path, root, problem) != XmlResult::kOk) throw std::invalid_argument(problem);
  const std::lock_guard lock(mutex_);
  Reader reader(root);
  for (const XmlElement& family : root.children) {
    if (family.name != "Family") continue;
    const std::string frame = Text(family, "frame");
    if (frame == "ftm59" || (frame == "ftm" && Text(family, "mode") == "current")) continue;
    reader.big = Text(family, "order") == "big";
    for (const XmlElement& element : family.children) {
      auto command = std::make_shared<DefinedCommand>();
      command->family = Text(family, "name");
      if (const XmlElement* const request = element.Child("Request")) command->request = reader.Fields(*request);
      if (const XmlElement* const reply = element.Child("Reply")) command->reply = reader.Fields(*reply);
      ResolveWords(command->request);
      ResolveWords(command->reply);
      const uint32_t id = Number(element, "id");
      if (frame == "ftm") {
        ftm_[static_cast<uint16_t>(Number(family, "mode"))][static_cast<uint16_t>(id)] = std::move(command);
      } else if (frame == "subsystem") {
        plain_.emplace_back(Number(family, "subsystem") << 16 | id, std::move(command));
      } else {
        plain_.emplace_back(kPlainCode | id, std::move(command));
      }
    }
  }
  for (const auto& mode : ftm_) {
    ftm.SetDispatcher(mode.first,
                      [this, &commands = mode.second](uint16_t id, ByteView fields) -> std::optional<Bytes> {
                        const auto command = commands.find(id);
                        Refusal refusal{};
                        return command != commands.end() ? Answer(*command->second, fields, refusal) : std::nullopt;
                      });
  }
}

void DefinedService::Register(RequestTable& table) {
  for (const auto& [key, command] : plain_) {
    const size_t header = (key & kPlainCode) != 0 ? 1 : 4;
    const auto answer = [this, header, found = command](ByteView request, Wire& wire) {
      Refusal refusal{};
      const auto reply = Answer(*found, request.subspan(header), refusal);
      if (!reply) return Refuse(refusal, request, wire);
      wire.Send(ByteWriter().Raw(request.first(header)).Raw(*reply).Take());
    };
    if (header == 1) {
      table.On(static_cast<uint8_t>(key), Length::AtLeast(header), answer);
    } else {
      table.OnSubsystem(static_cast<uint8_t>(key >> 16), static_cast<uint16_t>(key), Length::AtLeast(header), answer);
    }
  }
}

void DefinedService::OnReset() {
  const std::lock_guard lock(mutex_);
  remembered_.clear();
}

void DefinedService::Set(const std::string& path, const std::string& value) {
  std::string kept = Checked(path, value);
  const std::lock_guard lock(mutex_);
  fixed_[path] = std::move(kept);
}

std::string DefinedService::Checked(const std::string& path, const std::string& value) const {
  const std::lock_guard lock(mutex_);
  std::vector<std::shared_ptr<DefinedCommand>> commands;
  for (const auto& known : plain_) commands.push_back(known.second);
  for (const auto& mode : ftm_) {
    for (const auto& known : mode.second) commands.push_back(known.second);
  }
  const std::string family = FamilyOf(path);
  std::string fault = "no command of the family has a reply with this field";
  for (const auto& command : commands) {
    if (command->family + "." != family) continue;
    try {
      if (const auto kept = CheckedValue(command->reply, path.substr(family.size()), value)) return *kept;
    } catch (const std::invalid_argument& error) {  // another command may have a field of the same name
      fault = error.what();
    }
  }
  throw std::invalid_argument(fault);
}

std::optional<std::string> DefinedService::Value(const std::string& path) const {
  const std::lock_guard lock(mutex_);
  const auto found = remembered_.find(path);
  return found != remembered_.end() ? std::optional(found->second) : std::nullopt;
}

// Fields of one name mean the same in all commands of a family.
std::optional<Bytes> DefinedService::Answer(const DefinedCommand& command, ByteView fields, Refusal& refusal) {
  const auto set = TakeDefined(command.request, fields, refusal);
  if (!set) return std::nullopt;
  const std::lock_guard lock(mutex_);
  const std::string family = command.family + ".";
  // Of an array nothing is left of what was longer before.
  for (const auto& [path, value] : *set) {
    if (const size_t bracket = path.find("[0]"); bracket != std::string::npos) {
      const std::string array = family + path.substr(0, bracket + 1);
      std::erase_if(remembered_, [&](const auto& known) { return known.first.starts_with(array); });
    }
  }
  for (const auto& [path, value] : *set) remembered_[family + path] = value;
  DefinedValues values;
  for (const DefinedValues* const known : {&std::as_const(remembered_), &std::as_const(fixed_)}) {
    for (const auto& [path, value] : *known) {
      if (FamilyOf(path) == family) values[path.substr(family.size())] = value;
    }
  }
  return MakeDefined(command.reply, values);
}

}  // namespace kral::handset
