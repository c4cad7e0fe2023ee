// kral nv read, write, dump, diff, defs: NV items by their definitions. Backups are in nv_backup_verbs.cpp.
#include <fmt/format.h>

#include <CLI/CLI.hpp>
#include <charconv>
#include <memory>

#include "tools/kral/nv_items.h"
#include "tools/kral/progress.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct Arguments {
  NvOptions options;
  std::vector<std::string> items;
  std::string item;
  std::string value;
  std::uint16_t array_index = 0;
  std::string range;
  std::string source_file;
  std::string pkv_file;
  std::string first, second, page;
};

// Definitions and files need the library's NV tool and no handset: the null port answers for one.
SessionOptions WithoutHandset(const Context& context) {
  SessionOptions options = context.session;
  options.port = fmt::to_string(KRAL_PORT_NULL);
  return options;
}

void ReadItems(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  Json read = Json::array();
  std::string text;
  std::string missing;
  for (const std::string& which : arguments.items) {
    const NvItem item = items.Find(which);
    std::uint16_t status = 0;
    if (items.Read(item, status)) {
      read.push_back(items.ToJson(item));
      text += items.ToText(item);
      continue;
    }
    missing += fmt::format("{}{} (status {})", missing.empty() ? "" : ", ", item.Title(), DescribeNvStatus(status));
  }
  if (missing.empty()) return context.out.Result({{"port", session.port()}, {"items", read}}, text);
  context.found["items"] = read;
  if (!context.out.json() && !text.empty()) context.out.Note(text);
  throw ToolError(ExitCode::kRefused, fmt::format("the handset gives no value for {}", missing),
                  "an item that was never written has none");
}

void WriteItem(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  const NvItem item = items.Find(arguments.item);
  items.Write(item, arguments.array_index, arguments.value);
  std::uint16_t status = 0;
  if (!items.Read(item, status)) {
    throw ToolError(ExitCode::kMismatch, fmt::format("{} was written and cannot be read back", item.Title()),
                    "the item may be one that can only be written");
  }
  context.out.Result({{"port", session.port()}, {"item", items.ToJson(item)}}, items.ToText(item));
}

// "0-999", "453": the ids to be read without definitions.
std::vector<NvItem> ItemsOfRange(const NvItems& items, const std::string& range) {
  std::uint32_t first = 0;
  std::uint32_t last = 0;
  const char* const end = range.data() + range.size();
  auto parsed = std::from_chars(range.data(), end, first);
  last = first;
  if (parsed.ec == std::errc() && parsed.ptr != end && *parsed.ptr == '-') {
    parsed = std::from_chars(parsed.ptr + 1, end, last);
  }
  if (parsed.ec != std::errc() || parsed.ptr != end || first > last || last > 0xFFFF) {
    throw ToolError(ExitCode::kUsage, fmt::format("{} is no range of NV ids", range), "such as --items 0-999");
  }
  std::vector<NvItem> found;
  for (std::uint32_t id = first; id <= last; ++id) found.push_back(items.Find(fmt::to_string(id)));
  return found;
}

void Dump(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  const std::vector<NvItem> wanted = arguments.range.empty() ? items.all() : ItemsOfRange(items, arguments.range);
  if (wanted.empty()) {
    throw ToolError(ExitCode::kUsage, "nothing says which items to read", "give --defs FILE, or --items 0-999");
  }
  Json read = Json::array();
  std::string text;
  std::size_t missing = 0;
  {
    Progress progress(context.out, "dump", wanted.size(), Progress::Unit::kItems);
    for (const NvItem& item : wanted) {
      progress.Describe(item.Title());
      std::uint16_t status = 0;
      if (items.Read(item, status)) {
        read.push_back(items.ToJson(item));
        text += items.ToText(item);
      } else {
        ++missing;
      }
      progress.Advance(1);
    }
  }
  if (!arguments.source_file.empty()) {
    items.Check(KRAL_NV_WriteNVsToSource(session.handle(), arguments.source_file.c_str()), arguments.source_file);
  }
  if (!arguments.pkv_file.empty()) {
    items.Check(KRAL_NV_WriteNVsToPKV(session.handle(), arguments.pkv_file.c_str()), arguments.pkv_file);
  }
  context.out.Note(fmt::format("{} items read, {} without a value", read.size(), missing));
  context.out.Result({{"port", session.port()}, {"without_value", missing}, {"items", read}}, text);
}

void Compare(Context& context, const Arguments& arguments) {
  Session session(WithoutHandset(context));
  const NvItems items(session, arguments.options);
  session.Begin();
  items.Check(
      KRAL_NV_PKV_Diff(session.handle(), arguments.first.c_str(), arguments.second.c_str(), arguments.page.c_str()),
      "the comparison");
  context.out.Result({{"report", arguments.page}}, fmt::format("{}\n", arguments.page));
}

std::string FormText(const NvForm& form) {
  std::string text;
  for (const NvMember& member : form.members) {
    text += fmt::format("{}{}: {}", text.empty() ? "" : ", ", member.name, member.type);
    if (member.count > 1) text += fmt::format("[{}]", member.count);
  }
  return text;
}

Json FormJson(const NvForm& form) {
  Json members = Json::array();
  for (const NvMember& member : form.members) {
    members.push_back({{"name", member.name}, {"type", member.type}, {"count", member.count}});
  }
  Json json{{"members", members}};
  if (!form.selector.empty()) json["variant"] = form.selector;
  return json;
}

void ListDefinitions(Context& context, Arguments arguments) {
  arguments.options.definitions = arguments.items;
  Session session(WithoutHandset(context));
  const NvItems items(session, arguments.options);
  Json rows = Json::array();
  std::string text;
  for (const NvItem& item : items.all()) {
    Json row = Json::object();
    if (item.id) row["id"] = *item.id;
    if (!item.path.empty()) row["path"] = item.path;
    row["name"] = item.name;
    if (item.max_index > 0) row["max_index"] = item.max_index;
    row["forms"] = Json::array();
    text += item.Title() + (item.max_index > 0 ? fmt::format(" [0-{}]", item.max_index) : "") + "\n";
    for (const NvForm& form : item.forms) {
      row["forms"].push_back(FormJson(form));
      text += fmt::format("  {}{}\n", form.selector.empty() ? "" : form.selector + " -> ", FormText(form));
    }
    rows.push_back(std::move(row));
  }
  context.out.Result({{"definitions", rows}}, text);
}

void AddDefinitionOptions(CLI::App& verb, const std::shared_ptr<Arguments>& arguments) {
  verb.add_option("--defs", arguments->options.definitions, "Definition file; may be given several times")
      ->allow_extra_args(false);
  verb.add_option("--types", arguments->options.dictionaries, "Data-type dictionary that the definitions use")
      ->allow_extra_args(false);
}

}  // namespace

void AddNvVerbs(CLI::App& app, Context& context) {
  const auto arguments = std::make_shared<Arguments>();
  const auto present = app.get_subcommands([](const CLI::App* noun) { return noun->get_name() == "nv"; });
  auto* nv = present.empty() ? app.add_subcommand("nv", "NV items of the handset") : present.front();
  nv->require_subcommand(1);
  const auto add = [&](const char* name, const char* help, auto act) {
    auto* verb = nv->add_subcommand(name, help);
    verb->callback(
        [&context, arguments, act] { context.run = [&context, arguments, act] { act(context, *arguments); }; });
    return verb;
  };
  const auto add_subscription = [&](CLI::App& verb) {
    verb.add_option("--subscription", arguments->options.subscription, "Of a handset with several, from 0");
  };

  auto* read = add("read", "Print the values of items", ReadItems);
  read->add_option("item", arguments->items, "NV id, path on the handset, or name in a definition file")->required();
  auto* write = add("write", "Write an item and print what it holds then", WriteItem);
  write->add_option("item", arguments->item, "NV id, path, or name")->required();
  write
      ->add_option("value", arguments->value, "Decimal numbers such as 1,2,3; hex bytes for an item without definition")
      ->required();
  write->add_option("--index", arguments->array_index, "Element of an array item");
  auto* dump = add("dump", "Print the values of all items that are defined", Dump);
  dump->add_option("--items", arguments->range, "Range of NV ids instead, such as 0-999");
  dump->add_option("--source", arguments->source_file,
                   "Write the values of defined items to this source file (XML), too");
  dump->add_option("--pkv", arguments->pkv_file, "... to this PKV file");
  auto* diff = add("diff", "Compare two PKV files in a page of HTML; needs no handset", Compare);
  diff->add_option("first", arguments->first, "PKV file")->required();
  diff->add_option("second", arguments->second, "PKV file")->required();
  diff->add_option("page", arguments->page, "HTML file to be written")->required();
  auto* definitions = add("defs", "Print what definition files define; needs no handset", ListDefinitions);
  definitions->add_option("file", arguments->items, "Definition file")->required();
  definitions->add_option("--types", arguments->options.dictionaries, "Data-type dictionary that they use")
      ->allow_extra_args(false);
  for (auto* verb : {read, write, dump}) {
    AddDefinitionOptions(*verb, arguments);
    add_subscription(*verb);
  }
  AddDefinitionOptions(*diff, arguments);
}

}  // namespace kral::tool
