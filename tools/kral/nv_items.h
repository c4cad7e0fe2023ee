// Items with their definitions, over the library's NV tool: what to call them, and what their values say.
#ifndef KRAL_TOOLS_NV_ITEMS_H
#define KRAL_TOOLS_NV_ITEMS_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kral/output.h"
#include "tools/kral/session.h"

namespace kral::tool {

struct NvOptions {
  std::vector<std::string> definitions;  // files, loaded in this order
  std::vector<std::string> dictionaries;
  std::optional<std::uint16_t> subscription;
};

struct NvMember {
  std::string name;
  std::string type;  // "word16", or "signed word16"
  std::size_t count = 1;
};

struct NvForm {
  std::string selector;  // first number of the values that have this form; empty: all others
  std::vector<NvMember> members;
};

struct NvItem {
  std::optional<std::uint16_t> id;
  std::string path;  // empty: a numbered item
  std::string name;
  std::uint16_t max_index = 0;
  bool defined = true;  // false: nothing is known but its bytes
  std::vector<NvForm> forms;

  std::string Title() const;  // "453 FTM_MODE"
};

class NvItems {
 public:
  // Loads the definition files; ToolError when one cannot be used.
  NvItems(Session& session, const NvOptions& options);

  const std::vector<NvItem>& all() const { return items_; }
  // By id, path or name. An id or a path that nobody defined is an item of bytes; ToolError for an unknown name.
  NvItem Find(const std::string& which) const;

  // Reads the item from the handset; false when the handset has no value for it (its status is then in `status`).
  bool Read(const NvItem& item, std::uint16_t& status);
  // Writes it: decimal numbers where it is defined, else bytes in hex.
  void Write(const NvItem& item, std::uint16_t array_index, const std::string& value);

  // What was read, as JSON and as lines of text. Array items have an element for each index that has a value.
  Json ToJson(const NvItem& item) const;
  std::string ToText(const NvItem& item) const;

  // Throws for any error code but 0 and those allowed.
  void Check(std::uint32_t code, const std::string& what, std::uint32_t allowed = 0) const;

 private:
  std::optional<std::string> Value(const NvItem& item, std::uint16_t array_index) const;
  void LoadFile(const std::string& file, bool dictionary);
  void ListItems();

  Session& session_;
  const NvOptions options_;
  std::vector<NvItem> items_;
  std::vector<std::uint8_t> bytes_;  // of the item without definition that was read last
};

std::string DescribeNvStatus(std::uint16_t status);

}  // namespace kral::tool

#endif
