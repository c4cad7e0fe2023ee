// Writes results, notes and failures; knows nothing of what they are about.
#include "tools/kral/output.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <iterator>

#include "tools/kral/format.h"
#include "tools/kral/safe_text.h"

namespace kral::tool {
namespace {

constexpr std::size_t kDumpWidth = 16;

bool IsPrintable(char character) {
  return character >= ' ' && character <= '~';
}

constexpr std::array<const char*, 8> kStatusKinds{"none", "refusal", "reply",   "efs",
                                                  "nv",   "loader",  "command", "result"};
static_assert(kStatusKinds.size() == KRAL_ERROR_STATUS_RESULT + 1);

// What the record of the library says beyond code and text.
void AddRecord(Json& error, const KRAL_ERROR& record) {
  if (record.function[0] != '\0') error["function"] = record.function;
  if (record.status_kind != KRAL_ERROR_STATUS_NONE && record.status_kind < kStatusKinds.size()) {
    error["status"] = {{"kind", kStatusKinds[record.status_kind]}, {"value", record.status}};
  }
  if ((record.present & KRAL_ERROR_HAS_OFFSET) != 0) error["offset"] = record.offset;
  if ((record.present & KRAL_ERROR_HAS_LINE) != 0) error["line"] = record.line;
  if (record.system_error != 0) error["system_error"] = record.system_error;
}

void WriteData(std::string_view text) {
  const bool written = std::fwrite(text.data(), 1, text.size(), stdout) == text.size() && std::fflush(stdout) == 0;
  if (!written) {
    throw ToolError(ExitCode::kInternal, "the result cannot be written to the standard output",
                    "check the disk or the program at the other end of the pipe");
  }
}

}  // namespace

void Output::Result(const Json& members, std::string_view text) const {
  if (!json_) return Data(text);
  lane_ != nullptr ? lane_->Object(members) : WriteObject(true, members);
}

void Output::Data(std::string_view text) const {
  lane_ != nullptr ? lane_->Data(text) : WriteData(text);
}

void Output::Stream(const Json& members, std::string_view text) const {
  if (json_) {
    WriteData(JsonLine(members));
  } else {
    Data(text);
  }
}

void Output::Note(std::string_view text) const {
  if (lane_ != nullptr) {
    lane_->Note(text);
  } else if (json_) {
    const Json object{{"event", "note"}, {"text", text}};
    WriteAside(JsonLine(object));
  } else {
    WriteAside(Format("kral: {}\n", SafeText(text)));
  }
}

void Output::Failure(const ToolError& error, const Json& members) const {
  if (!json_) {
    WriteAside(Format("kral: {}\n", SafeText(error.what())));
    if (!error.hint().empty()) WriteAside(Format("      {}\n", SafeText(error.hint())));
    return;
  }
  Json object = members;
  object["error"] = ErrorJson(error);
  WriteObject(false, object);
}

void Output::WriteObject(bool ok, const Json& members) const {
  Json object{{"ok", ok}, {"schema", kSchema}};
  object.update(members);
  WriteData(JsonLine(object));
}

Json ErrorJson(const ToolError& error) {
  Json object{{"code", static_cast<int>(error.code())},
              {"name", NameOf(error.code())},
              {"text", error.what()},
              {"hint", error.hint()}};
  if (error.record()) AddRecord(object, *error.record());
  return object;
}

void WriteAside(std::string_view text) noexcept {
  std::fwrite(text.data(), 1, text.size(), stderr);
}

std::string JsonLine(const Json& object) {
  const std::string text = object.dump();
  std::string line;
  line.reserve(text.size() + 1);
  // They stand in strings only.
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto at = [&text](std::size_t place) { return static_cast<unsigned char>(text[place]); };
    const bool is_control = at(i) == 0xC2 && i + 1 < text.size() && at(i + 1) < 0xA0;
    if (is_control || at(i) == 0x7F) {
      line += Format("\\u{:04x}", at(is_control ? ++i : i));
    } else {
      line += text[i];
    }
  }
  return line + "\n";
}

std::string Printable(std::string_view text) {
  const auto end = text.find_last_not_of(std::string_view(" \0", 2));
  std::string shown(text.substr(0, end == std::string_view::npos ? 0 : end + 1));
  std::replace_if(
      shown.begin(), shown.end(), [](char character) { return !IsPrintable(character); }, '?');
  return shown;
}

std::string HexText(std::span<const std::uint8_t> bytes) {
  std::string text;
  for (const auto byte : bytes) text += Format("{}{:02X}", text.empty() ? "" : " ", byte);
  return text;
}

std::string HexDump(std::span<const std::uint8_t> bytes) {
  std::string dump;
  for (std::size_t offset = 0; offset < bytes.size(); offset += kDumpWidth) {
    const auto line = bytes.subspan(offset, std::min(kDumpWidth, bytes.size() - offset));
    std::string characters;
    std::ranges::transform(line, std::back_inserter(characters), [](std::uint8_t byte) {
      const auto character = static_cast<char>(byte);
      return IsPrintable(character) ? character : '.';
    });
    dump += Format("{:04X}  {:<{}}  {}\n", offset, HexText(line), kDumpWidth * 3 - 1, characters);
  }
  return dump;
}

}  // namespace kral::tool
