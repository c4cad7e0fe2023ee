// Writes the header: C89 and C++, functions that set fields by name, send, and fill a struct with the reply.
#include "tools/kral/cmd/cmd_header.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <map>
#include <set>
#include <string_view>
#include <utility>

#include "tools/kral/cmd/c_names.h"
#include "tools/kral/format.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLongestReply = 6144;
constexpr std::uint32_t kLongestContent = 64 << 10;  // of a zlib stream
constexpr std::size_t kLargestStruct = 256 << 10;    // it may have to find room on a stack
constexpr std::size_t kLongestPath = 509;            // what C89 promises to take as a text

constexpr std::string_view kHelpers = R"(#include <kral/kral.h>
#include <string.h>

#if defined(__cplusplus)
#define KRAL_CMD_INLINE inline
#elif defined(__STDC_VERSION__) && __STDC_VERSION__ >= 199901L
#define KRAL_CMD_INLINE static inline
#elif defined(__GNUC__)
#define KRAL_CMD_INLINE static __inline__
#elif defined(_MSC_VER)
#define KRAL_CMD_INLINE static __inline
#else
#define KRAL_CMD_INLINE static
#endif

#ifndef KRAL_CMD_HELPERS
#define KRAL_CMD_HELPERS
KRAL_CMD_INLINE uint8_t kral_cmd_set_integer(KRAL_HANDLE handle, uint32_t call, const char* path, uint32_t element,
                                             int64_t value) {
  uint32_t index;
  return (uint8_t)(KRAL_CMD_GetFieldIndex(handle, call, 0, path, &index) &&
                   KRAL_CMD_SetInteger(handle, call, index, element, value));
}
KRAL_CMD_INLINE uint8_t kral_cmd_set_real(KRAL_HANDLE handle, uint32_t call, const char* path, uint32_t element,
                                          double value) {
  uint32_t index;
  return (uint8_t)(KRAL_CMD_GetFieldIndex(handle, call, 0, path, &index) &&
                   KRAL_CMD_SetReal(handle, call, index, element, value));
}
KRAL_CMD_INLINE uint8_t kral_cmd_set_bytes(KRAL_HANDLE handle, uint32_t call, const char* path, const void* bytes,
                                           size_t size) {
  uint32_t index;
  return (uint8_t)(KRAL_CMD_GetFieldIndex(handle, call, 0, path, &index) &&
                   KRAL_CMD_SetBytes(handle, call, index, 0, (const uint8_t*)bytes, (uint32_t)size));
}
KRAL_CMD_INLINE uint32_t kral_cmd_elements(KRAL_HANDLE handle, uint32_t call, const char* path, uint32_t most) {
  uint32_t index;
  uint32_t count = 0;
  if (KRAL_CMD_GetFieldIndex(handle, call, 1, path, &index)) KRAL_CMD_GetElements(handle, call, index, &count);
  return count < most ? count : most;
}
KRAL_CMD_INLINE int64_t kral_cmd_integer(KRAL_HANDLE handle, uint32_t call, const char* path, uint32_t element) {
  uint32_t index;
  int64_t value = 0;
  if (KRAL_CMD_GetFieldIndex(handle, call, 1, path, &index)) {
    KRAL_CMD_GetInteger(handle, call, index, element, &value);
  }
  return value;
}
KRAL_CMD_INLINE double kral_cmd_real(KRAL_HANDLE handle, uint32_t call, const char* path, uint32_t element) {
  uint32_t index;
  double value = 0;
  if (KRAL_CMD_GetFieldIndex(handle, call, 1, path, &index)) KRAL_CMD_GetReal(handle, call, index, element, &value);
  return value;
}
KRAL_CMD_INLINE uint32_t kral_cmd_bytes(KRAL_HANDLE handle, uint32_t call, const char* path, void* bytes,
                                        uint32_t room) {
  uint32_t index;
  uint32_t size = room;
  if (!KRAL_CMD_GetFieldIndex(handle, call, 1, path, &index)) return 0;
  return KRAL_CMD_GetBytes(handle, call, index, 0, (uint8_t*)bytes, &size) ? size : 0;
}
#endif
)";

// A field with a value, and what the groups around it make of it.
struct Leaf {
  KRAL_CMD_FIELD field;
  std::string path;   // whole: a record cuts it
  std::string array;  // the path of the innermost array
  std::string name;   // of its parameter or member
  std::string count;  // of the parameter that says how many elements there are
  unsigned arrays = 0;
  bool variable = false;  // the innermost array may have fewer elements
  bool conditional = false;
  bool packed = false;  // in a zlib stream
  std::uint32_t elements = 1;
};

// A word of an enumeration.
struct WordMacro {
  std::string name;
  std::int64_t value;
};

std::vector<Leaf> LeavesOf(const std::vector<KRAL_CMD_FIELD>& fields) {
  std::vector<Leaf> leaves;
  std::vector<Leaf> groups;  // around the field, the outermost first
  for (const KRAL_CMD_FIELD& field : fields) {
    groups.resize(std::min<std::size_t>(groups.size(), field.depth));
    Leaf leaf = groups.empty() ? Leaf{} : groups.back();
    leaf.field = field;
    if (!leaf.path.empty()) leaf.path += '.';
    leaf.path += field.name;
    if ((field.flags & KRAL_CMD_FIELD_ARRAY) != 0) {
      ++leaf.arrays;
      leaf.array = leaf.path;
      leaf.variable = (field.flags & KRAL_CMD_FIELD_VARIABLE) != 0;
      leaf.elements *= field.count;
    }
    leaf.conditional = leaf.conditional || (field.flags & KRAL_CMD_FIELD_CONDITIONAL) != 0;
    leaf.packed = leaf.packed || field.kind == KRAL_CMD_KIND_ZLIB;
    (field.index == KRAL_CMD_NO_INDEX ? groups : leaves).push_back(std::move(leaf));
  }
  return leaves;
}

bool IsNumber(const Leaf& leaf) {
  return leaf.field.kind <= KRAL_CMD_KIND_REAL;
}

unsigned BitsInC(const KRAL_CMD_FIELD& field) {
  unsigned bits = 8;
  while (bits < field.bits) bits *= 2;
  return bits;
}

std::string TypeOf(const KRAL_CMD_FIELD& field) {
  if (field.kind == KRAL_CMD_KIND_REAL) return field.bits == 32 ? "float" : "double";
  return Format("{}int{}_t", field.kind == KRAL_CMD_KIND_SIGNED ? "" : "u", BitsInC(field));
}

// Elements of an array, or bytes of a text or block: all that a reply may hold, and no more than it has room for.
std::uint32_t RoomOf(const Leaf& leaf) {
  const std::uint32_t most = IsNumber(leaf) ? leaf.elements : leaf.field.room;
  if (!leaf.packed) return std::min(most, kLongestReply);
  const unsigned bytes = IsNumber(leaf) ? std::max(leaf.field.bits / 8, 1U) : 1;
  return leaf.arrays > 1 ? most : std::min(most, kLongestContent / bytes);
}

// Of C: neither ends nor begins a comment.
std::string CommentText(std::string text) {
  for (std::size_t at = 0; (at = text.find("*/", at)) != std::string::npos;) text.insert(at + 1, " ");
  for (std::size_t at = 0; (at = text.find("/*", at)) != std::string::npos;) text.insert(at + 1, " ");
  return text;
}

class FunctionWriter {
 public:
  FunctionWriter(const Session& session, const DefinedCommand& command)
      : command_(command),
        request_(LeavesOf(FieldsOf(session, command, false))),
        reply_(LeavesOf(FieldsOf(session, command, true))),
        name_(command.name) {
    std::ranges::replace(name_, '.', '_');
    std::erase_if(request_, [](const Leaf& leaf) { return (leaf.field.flags & KRAL_CMD_FIELD_COUNTS) != 0; });
    // Texts in arrays have no place in a struct; KRAL_CMD_GetReply still gives them.
    std::erase_if(reply_, [](const Leaf& leaf) { return !IsNumber(leaf) && leaf.arrays > 0; });
    FindWords(session, request_, false);
    FindWords(session, reply_, true);
  }

  // Takes the names that the command needs in the header; else why there is no function for it.
  std::string Claim(HeaderNames& names) {
    if (auto fault = Fault(names); !fault.empty()) return fault;
    for (const auto& name : Things()) names.Add(name);
    std::erase_if(words_, [&names](const WordMacro& word) { return !names.Add(word.name, word.value); });
    return {};
  }

  // When all commands have their names.
  std::string Run(const HeaderNames& names) {
    NameParameters(names);
    LocalNames members(names, {name_, ReplyName()});
    for (Leaf& leaf : reply_) leaf.name = members.Take(leaf.path);
    for (const auto& [name, value] : words_) text_ += Format("#define {} ((int64_t){})\n", name, Number(value));
    WriteStruct();
    WriteComment();
    WriteHead();
    WriteBody();
    return text_;
  }

 private:
  std::string ReplyName() const { return name_ + "_REPLY"; }
  // The function and the struct.
  std::vector<std::string> Things() const {
    return reply_.empty() ? std::vector{name_} : std::vector{name_, ReplyName()};
  }

  void FindWords(const Session& session, const std::vector<Leaf>& leaves, bool of_reply) {
    std::array<char, 256> word{};
    for (const Leaf& leaf : leaves) {
      std::int64_t value = 0;
      for (std::uint32_t i = 0; KRAL_CMD_GetWord(session.handle(), command_.name.c_str(), of_reply ? 1 : 0,
                                                 leaf.field.index, i, word.data(), word.size(), &value) != 0;
           ++i) {
        words_.push_back(
            {MacroName(Format("{}_{}{}_{}", name_, of_reply ? "REPLY_" : "", leaf.path, word.data())), value});
      }
    }
  }

  std::string Fault(const HeaderNames& names) const {
    // A parameter is always there, and has at most one dimension.
    const auto is_no_parameter = [](const Leaf& leaf) {
      return leaf.conditional || leaf.arrays > 1 || (leaf.arrays == 1 && !IsNumber(leaf));
    };
    if (std::ranges::any_of(request_, is_no_parameter)) return "no parameters can stand for its fields";
    const auto is_long = [](const Leaf& leaf) { return leaf.path.size() > kLongestPath; };
    if (std::ranges::any_of(request_, is_long) || std::ranges::any_of(reply_, is_long)) {
      return Format("a field has a path of more than {} characters", kLongestPath);
    }
    std::size_t size = 0;
    for (const Leaf& leaf : reply_) {
      size += IsNumber(leaf) ? std::size_t{BitsInC(leaf.field) / 8} * std::max(RoomOf(leaf), 1U) : RoomOf(leaf);
    }
    if (size > kLargestStruct) return Format("its reply may take {} bytes, which max_count or max_size limit", size);
    return FaultOfNames(names);
  }

  std::string FaultOfNames(const HeaderNames& names) const {
    HeaderNames own;
    for (const auto& name : Things()) {
      if (!names.MayAdd(name)) return Format("{} has a meaning already", name);
      own.Add(name);
    }
    for (const auto& [name, value] : words_) {
      if (!own.MayAdd(name, value) || !names.MayAdd(name, value)) return Format("{} would mean two things", name);
      own.Add(name, value);
    }
    return {};
  }

  void NameParameters(const HeaderNames& header) {
    LocalNames names(header, {name_, ReplyName()});
    std::map<std::string, std::string> records;  // those that are arrays
    for (Leaf& leaf : request_) {
      const bool in_records = leaf.variable && leaf.array != leaf.path;
      if (in_records && !records.contains(leaf.array)) records.emplace(leaf.array, names.Take(leaf.array));
      leaf.name = names.Take(leaf.path);
      if (leaf.variable) leaf.count = Format("{}_count", in_records ? records[leaf.array] : leaf.name);
    }
  }

  // The least of all has no literal.
  static std::string Number(std::int64_t value) {
    constexpr std::int64_t kLeast = INT64_MIN;
    return value == kLeast ? Format("({} - 1)", value + 1) : Format("{}", value);
  }

  void WriteStruct() {
    if (reply_.empty()) return;
    text_ += Format("typedef struct {} {{\n", ReplyName());
    for (const Leaf& leaf : reply_) {
      const auto& name = leaf.name;
      if (!IsNumber(leaf)) {
        const bool is_text = leaf.field.kind == KRAL_CMD_KIND_TEXT;
        const auto room = RoomOf(leaf) + (is_text ? 1 : 0);
        text_ += Format("  {} {}[{}];", is_text ? "char" : "uint8_t", name, room);
        if (!is_text) text_ += Format("\n  uint32_t {}_size;", name);
      } else if (leaf.arrays > 0) {
        text_ += Format("  {} {}[{}];\n  uint32_t {}_count;", TypeOf(leaf.field), name, RoomOf(leaf), name);
      } else {
        text_ += Format("  {} {};", TypeOf(leaf.field), name);
        if (leaf.conditional) text_ += Format("\n  uint32_t {}_count;", name);
      }
      text_ += leaf.field.unit[0] != '\0' ? Format(" /* {} */\n", CommentText(leaf.field.unit)) : "\n";
    }
    text_ += Format("}} {};\n\n", ReplyName());
  }

  void WriteComment() {
    text_ += Format("/* {}{}{}\n", command_.name, command_.record.documentation[0] != '\0' ? ": " : "",
                    CommentText(command_.record.documentation));
    for (const Leaf& leaf : request_) {
      const auto& field = leaf.field;
      text_ += " *   " + leaf.name;
      if (IsNumber(leaf)) text_ += Format("  {:.15g} to {:.15g}", field.least, field.most);
      if (field.room != 0) text_ += Format("  up to {} bytes", field.room);
      if (field.unit[0] != '\0') text_ += Format(" {}", CommentText(field.unit));
      if (leaf.arrays != 0) text_ += Format(", [{}{}]", leaf.variable ? "up to " : "", leaf.elements);
      text_ += Format("{}{}\n", field.documentation[0] != '\0' ? "  " : "", CommentText(field.documentation));
    }
    text_ += " * Gives 1, or 0 with the reason in KRAL_GetLastError. */\n";
  }

  void WriteHead() {
    text_ += Format("KRAL_CMD_INLINE uint8_t {}(KRAL_HANDLE handle", name_);
    std::set<std::string> counts;
    for (const Leaf& leaf : request_) {
      if (leaf.field.kind == KRAL_CMD_KIND_TEXT) {
        text_ += Format(", const char* {}", leaf.name);
      } else if (leaf.field.kind == KRAL_CMD_KIND_BYTES) {
        text_ += Format(", const void* {}, uint32_t {}_size", leaf.name, leaf.name);
      } else if (leaf.arrays == 0) {
        text_ += Format(", {} {}", TypeOf(leaf.field), leaf.name);
      } else {
        text_ += Format(", const {}* {}", TypeOf(leaf.field), leaf.name);
        if (leaf.variable && counts.insert(leaf.count).second) text_ += Format(", uint32_t {}", leaf.count);
      }
    }
    if (!reply_.empty()) text_ += Format(", {}* reply", ReplyName());
    text_ += ") {\n";
  }

  static std::string CountOf(const Leaf& leaf) { return leaf.variable ? leaf.count : Format("{}", leaf.elements); }

  void WriteBody() {
    const auto is_array = [](const Leaf& leaf) { return leaf.arrays > 0; };
    const bool loops = std::ranges::any_of(request_, is_array) || std::ranges::any_of(reply_, is_array);
    text_ += "  uint32_t call;\n  uint8_t done = 1;\n";
    if (loops) text_ += "  uint32_t i;\n";
    text_ += Format("  if (!KRAL_CMD_Prepare(handle, \"{}\", &call)) return 0;\n", command_.name);
    for (const Leaf& leaf : request_) WriteSet(leaf);
    text_ += "  done = (uint8_t)(done && KRAL_CMD_Send(handle, call));\n";
    if (!reply_.empty()) {
      text_ += "  if (done && reply != NULL) {\n    memset(reply, 0, sizeof *reply);\n";
      for (const Leaf& leaf : reply_) WriteGet(leaf);
      text_ += "  }\n";
    }
    text_ += "  KRAL_CMD_Release(handle, call);\n  return done;\n}\n\n";
  }

  void WriteSet(const Leaf& leaf) {
    const auto& path = leaf.path;
    const auto& name = leaf.name;
    if (leaf.field.kind == KRAL_CMD_KIND_TEXT) {
      text_ += Format(
          "  if ({} != NULL) done = (uint8_t)(done && kral_cmd_set_bytes(handle, call, \"{}\", {}, strlen({})));\n",
          name, path, name, name);
    } else if (!IsNumber(leaf)) {
      text_ += Format("  done = (uint8_t)(done && kral_cmd_set_bytes(handle, call, \"{}\", {}, {}_size));\n", path,
                      name, name);
    } else {
      const bool real = leaf.field.kind == KRAL_CMD_KIND_REAL;
      const auto call = [&](std::string_view element, const std::string& value) {
        return Format("done = (uint8_t)(done && kral_cmd_set_{}(handle, call, \"{}\", {}, ({}){}));\n",
                      real ? "real" : "integer", path, element, real ? "double" : "int64_t", value);
      };
      text_ += leaf.arrays == 0 ? "  " + call("0", name)
                                : Format("  for (i = 0; i < {}; ++i) ", CountOf(leaf)) + call("i", name + "[i]");
    }
  }

  void WriteGet(const Leaf& leaf) {
    const auto& path = leaf.path;
    const auto& name = leaf.name;
    if (leaf.field.kind == KRAL_CMD_KIND_TEXT) {
      text_ += Format("    kral_cmd_bytes(handle, call, \"{}\", reply->{}, sizeof reply->{} - 1);\n", path, name, name);
      return;
    }
    if (!IsNumber(leaf)) {
      text_ += Format("    reply->{}_size = kral_cmd_bytes(handle, call, \"{}\", reply->{}, sizeof reply->{});\n", name,
                      path, name, name);
      return;
    }
    const bool real = leaf.field.kind == KRAL_CMD_KIND_REAL;
    const auto value = [&](std::string_view element) {
      return Format("({})kral_cmd_{}(handle, call, \"{}\", {});\n", TypeOf(leaf.field), real ? "real" : "integer", path,
                    element);
    };
    if (leaf.arrays > 0 || leaf.conditional) {
      text_ += Format("    reply->{}_count = kral_cmd_elements(handle, call, \"{}\", {});\n", name, path, RoomOf(leaf));
    }
    if (leaf.arrays > 0) {
      text_ += Format("    for (i = 0; i < reply->{}_count; ++i) reply->{}[i] = {}", name, name, value("i"));
    } else {
      text_ += Format("    reply->{} = {}", name, value("0"));
    }
  }

  const DefinedCommand& command_;
  std::vector<Leaf> request_;
  std::vector<Leaf> reply_;
  std::string name_;
  std::vector<WordMacro> words_;
  std::string text_;
};

}  // namespace

CmdHeader MakeCmdHeader(const Session& session, const std::string& name) {
  CmdHeader header;
  const auto guard = MacroName("KRAL_COMMANDS_" + name);
  header.text = Format(
      "/* Made by kral cmd header. The definition file must be loaded (KRAL_CMD_LoadDefinitions). */\n"
      "#ifndef {}\n#define {}\n\n",
      guard, guard);
  header.text += kHelpers;
  header.text += '\n';
  const auto commands = ListCommands(session);
  HeaderNames names;
  std::vector<FunctionWriter> writers;
  for (const auto& command : commands) {
    FunctionWriter writer(session, command);
    if (const auto fault = writer.Claim(names); fault.empty()) {
      writers.push_back(std::move(writer));
    } else {
      header.left_out.push_back({command.name, fault});
      header.text += Format("/* {} is left out: {}. KRAL_CMD_Call takes it. */\n\n", command.name, fault);
    }
  }
  for (auto& writer : writers) header.text += writer.Run(names);
  header.text += "#endif\n";
  return header;
}

}  // namespace kral::tool
