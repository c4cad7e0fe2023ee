// kral nv read, write, dump, diff, defs: NV items by their definitions. Backups are in nv_backup_verbs.cpp.
#include <algorithm>
#include <array>
#include <charconv>
#include <memory>
#include <string_view>

#include "tools/kral/format.h"
#include "tools/kral/nv/nv_item_output.h"
#include "tools/kral/nv/nv_items.h"
#include "tools/kral/progress.h"
#include "tools/kral/result_lines.h"
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
  options.port = std::to_string(KRAL_PORT_NULL);
  return options;
}

// What a verb has read so far.
struct ReadSoFar {
  Json items = Json::array();
  Json refused = Json::array();
  std::string text;
  std::string refusals;  // "453 FTM_MODE (status 4), ..."
  std::string missing;   // the same of items without a value
  std::size_t without_value = 0;

  void Add(const NvItem& item, const NvReading& reading) {
    if (reading.has_value()) {
      items.push_back(ValueJson(item, reading));
      text += ValueText(item, reading);
      return;
    }
    const std::string reason = DescribeReading(item, reading);
    const bool is_refused = reading.kind == NvReading::Kind::kRefused;
    std::string& list = is_refused ? refusals : missing;
    list += Format("{}{} ({})", list.empty() ? "" : ", ", item.Title(), reason);
    if (!is_refused) {
      ++without_value;
      return;
    }
    Json row = TitleJson(item);
    row["reason"] = reason;
    refused.push_back(std::move(row));
  }

  // For the end of a verb that fails.
  void Keep(Context& context) const {
    context.found.update(Json{{"items", items}, {"without_value", without_value}, {"refused", refused}});
    if (!context.out.json() && !text.empty()) context.out.Data(text);
  }
};

void ReadAll(Context& context, NvItems& items, const std::vector<NvItem>& wanted, ReadSoFar& read) {
  try {
    Progress progress(context.out, "read", wanted.size(), Progress::Unit::kItems);
    for (const NvItem& item : wanted) {
      progress.Describe(item.Title());
      read.Add(item, items.Read(item));
      progress.Advance(1);
    }
  } catch (const ToolError&) {
    read.Keep(context);
    throw;
  }
}

void ReadItems(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  std::vector<NvItem> wanted;
  for (const std::string& which : arguments.items) wanted.push_back(items.Find(which));
  ReadSoFar read;
  ReadAll(context, items, wanted, read);
  const std::string missing =
      read.missing + (read.missing.empty() || read.refusals.empty() ? "" : ", ") + read.refusals;
  if (missing.empty()) return context.out.Result({{"port", session.port()}, {"items", read.items}}, read.text);
  read.Keep(context);
  throw ToolError(ExitCode::kRefused, Format("the handset gives no value for {}", missing),
                  read.refusals.empty() ? "an item that was never written has none"
                                        : "what is refused may need an unlock or another mode");
}

void WriteItem(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  const NvItem item = items.Find(arguments.item);
  items.Write(item, arguments.array_index, arguments.value);
  const NvReading reading = items.Read(item);
  if (!reading.has_value()) {
    throw ToolError(ExitCode::kMismatch, Format("{} was written and cannot be read back", item.Title()),
                    "the item may be one that can only be written");
  }
  context.out.Result({{"port", session.port()}, {"item", ValueJson(item, reading)}}, ValueText(item, reading));
}

// The library knows what can be written by the definitions alone.
template <class Ask>
void AskDefinitions(const Context& context, NvOptions options, Ask&& ask) {
  options.subscription.reset();
  Session session(OfNullPort(context.session));
  const NvItems items(session, options);
  ask(items);
}

void CheckRead(const Context& context, const Arguments& arguments) {
  AskDefinitions(context, arguments.options, [&](const NvItems& items) {
    for (const auto& which : arguments.items) items.Find(which);
  });
}

void CheckWrite(const Context& context, const Arguments& arguments) {
  AskDefinitions(context, arguments.options, [&](const NvItems& items) {
    items.Set(items.Find(arguments.item), arguments.array_index, arguments.value);
  });
}

std::vector<NvItem> ItemsOfRange(const NvItems& items, const std::string& range) {
  const auto [first, last] = ParseIdRange(range);
  std::vector<NvItem> found;
  for (std::uint32_t id = first; id <= last; ++id) found.push_back(items.Find(static_cast<std::uint16_t>(id)));
  return found;
}

std::vector<NvItem> ItemsToDump(const NvItems& items, const Arguments& arguments) {
  auto wanted = arguments.range.empty() ? items.all() : ItemsOfRange(items, arguments.range);
  if (!wanted.empty()) return wanted;
  throw ToolError(ExitCode::kUsage, "nothing says which items to read", "give --defs FILE, or --items 0-999");
}

void CheckDump(const Context& context, const Arguments& arguments) {
  AskDefinitions(context, arguments.options, [&](const NvItems& items) { ItemsToDump(items, arguments); });
}

void WriteFiles(const Session& session, const NvItems& items, const Arguments& arguments) {
  if (!arguments.source_file.empty()) {
    items.Check(KRAL_NV_WriteNVsToSource(session.handle(), arguments.source_file.c_str()), arguments.source_file);
  }
  if (!arguments.pkv_file.empty()) {
    items.Check(KRAL_NV_WriteNVsToPKV(session.handle(), arguments.pkv_file.c_str()), arguments.pkv_file);
  }
}

void Dump(Context& context, const Arguments& arguments) {
  Session session(context.session);
  NvItems items(session, arguments.options);
  const auto wanted = ItemsToDump(items, arguments);
  const bool to_files = !arguments.source_file.empty() || !arguments.pkv_file.empty();
  if (to_files) items.KeepUndefined();
  ReadSoFar read;
  ReadAll(context, items, wanted, read);
  context.out.Note(Format("{} read, {} without a value{}{}", Counted(read.items.size(), "item"), read.without_value,
                          read.refusals.empty() ? "" : ", refused: ", read.refusals));
  if (to_files) {
    try {
      if (read.items.empty()) {
        throw ToolError(ExitCode::kRefused, "the handset gave no value to write to a file",
                        "nothing was written; check the range of --items or the files of --defs");
      }
      session.Begin();
      WriteFiles(session, items, arguments);
    } catch (const ToolError&) {
      read.Keep(context);
      throw;
    }
  }
  context.out.Result({{"port", session.port()},
                      {"without_value", read.without_value},
                      {"refused", read.refused},
                      {"items", read.items}},
                     read.text);
}

// The counts of a comparison are in the line that the library writes about it.
struct DiffCounts {
  std::array<std::uint32_t, 4> values{};  // different, only in the first, only in the second, equal

  bool Read() {
    const std::string line = ResultLine(kDiffCounts).value_or("");
    std::size_t at = 0;
    for (std::uint32_t& value : values) {
      at = line.find_first_of("0123456789", at);
      if (at == std::string::npos) return false;
      const auto parsed = std::from_chars(line.data() + at, line.data() + line.size(), value);
      at = static_cast<std::size_t>(parsed.ptr - line.data());
    }
    return true;
  }
};

void Compare(Context& context, const Arguments& arguments) {
  Session session(WithoutHandset(context));
  const NvItems items(session, arguments.options);
  session.Begin();
  const std::uint32_t code =
      KRAL_NV_PKV_Diff(session.handle(), arguments.first.c_str(), arguments.second.c_str(), arguments.page.c_str());
  items.Check(code, code == KRAL_NV_ERROR_CANNOT_OPEN_REPORT ? arguments.page
                                                             : Format("{} and {}", arguments.first, arguments.second));
  DiffCounts counts;
  if (!counts.Read()) {
    throw ToolError(ExitCode::kInternal, "the library tells no counts", "--log FILE tells more");
  }
  const auto [different, only_first, only_second, equal] = counts.values;
  const Json members{
      {"report", arguments.page},
      {"counts",
       {{"equal", equal}, {"different", different}, {"only-in-first", only_first}, {"only-in-second", only_second}}}};
  const std::string text = Format("{}: {} equal, {} different, {} only in the first, {} only in the second\n",
                                  arguments.page, equal, different, only_first, only_second);
  if (different + only_first + only_second == 0) return context.out.Result(members, text);
  context.found = members;
  if (!context.out.json()) context.out.Data(text);
  throw ToolError(ExitCode::kMismatch, Format("{} and {} differ", arguments.first, arguments.second),
                  Format("{} shows in what", arguments.page));
}

void ListDefinitions(Context& context, Arguments arguments) {
  arguments.options.definitions = arguments.items;
  Session session(WithoutHandset(context));
  const NvItems items(session, arguments.options);
  Json rows = Json::array();
  std::string text;
  for (const NvItem& item : items.all()) {
    rows.push_back(DefinitionJson(item));
    text += DefinitionText(item);
  }
  context.out.Result({{"definitions", rows}}, text);
}

}  // namespace

void AddNvVerbs(const Command& root, Context& context) {
  const auto arguments = std::make_shared<Arguments>();
  const auto nv = root.Noun("nv", "NV items of the handset");
  const auto add = [&](const char* name, const char* help, auto act) {
    const auto verb = nv.Verb(name, help);
    verb.Run([&context, arguments, act] { act(context, *arguments); });
    return verb;
  };
  const auto add_subscription = [&](const Command& verb) {
    verb.Add("--subscription", arguments->options.subscription, "Of a handset with several, from 0");
  };

  const auto read = add("read", "Print the values of items", ReadItems);
  read.Add("item", arguments->items, "NV id, path on the handset, or name in a definition file").Required();
  const auto write = add("write", "Write an item and print what it holds then", WriteItem);
  write.Add("item", arguments->item, "NV id, path, or name").Required();
  write.Add("value", arguments->value, "Decimal numbers such as 1,2,3; hex bytes for an item without definition")
      .Required();
  write.Add("--index", arguments->array_index, "Element of an array item");
  const auto dump = add("dump", "Print the values of all items that are defined", Dump);
  dump.Add("--items", arguments->range, "Range of NV ids instead, such as 0-999");
  dump.Add("--source", arguments->source_file, "Write the values to this source file (XML), too").File();
  dump.Add("--pkv", arguments->pkv_file, "... to this PKV file").File();
  const auto diff = add("diff", "Compare two PKV files in a page of HTML; needs no handset", Compare);
  diff.NeedsNoHandset();
  diff.Add("first", arguments->first, "PKV file").Required();
  diff.Add("second", arguments->second, "PKV file").Required();
  diff.Add("page", arguments->page, "HTML file to be written").Required();
  diff.Writes([arguments] { return std::vector<std::string>{arguments->page}; });
  const auto definitions = add("defs", "Print what definition files define; needs no handset", ListDefinitions);
  definitions.NeedsNoHandset();
  definitions.Add("file", arguments->items, "Definition file").Required();
  AddDictionaryOption(definitions, arguments->options);
  dump.Writes([arguments] {
    std::vector<std::string> files;
    for (const auto& file : {arguments->source_file, arguments->pkv_file}) {
      if (!file.empty()) files.push_back(file);
    }
    return files;
  });
  read.Checks([&context, arguments] { CheckRead(context, *arguments); });
  write.Checks([&context, arguments] { CheckWrite(context, *arguments); });
  dump.Checks([&context, arguments] { CheckDump(context, *arguments); });
  for (const auto& verb : {read, write, dump}) {
    verb.ForMany();
    AddDefinitionOptions(verb, arguments->options);
    add_subscription(verb);
  }
  AddDefinitionOptions(diff, arguments->options);
}

}  // namespace kral::tool
