// kral completion, and what its scripts ask the tool for.
#include <cstdio>

#include "tools/kral/completion_scripts.h"
#include "tools/kral/format.h"
#include "tools/kral/verbs.h"

namespace kral::tool {
namespace {

struct Shell {
  std::string_view name;
  const char* script;
};

constexpr Shell kShells[] = {{"bash", kBashCompletion}, {"zsh", kZshCompletion}, {"fish", kFishCompletion}};

void PrintScript(const Context& context, const std::string& name) {
  for (const auto& shell : kShells) {
    if (shell.name == name) context.out.Result({{"shell", name}, {"script", shell.script}}, shell.script);
  }
}

// One line, and no tab: that stands in front of it.
std::string OnOneLine(std::string text) {
  for (auto& character : text) {
    if (static_cast<unsigned char>(character) < ' ') character = ' ';
  }
  return text;
}

}  // namespace

void AddCompletionVerbs(const Command& root, Context& context) {
  const auto shell = std::make_shared<std::string>();
  const auto completion = root.Verb("completion", "Print the script with which a shell completes command lines");
  completion.NeedsNoHandset();
  completion.AsksNobody();
  completion.Add("shell", *shell, "Which").Required().OneOf({"bash", "zsh", "fish"});
  completion.Run([&context, shell] { PrintScript(context, *shell); });
}

void PrintCompletions(CommandLine& line, const std::vector<std::string>& words) {
  const auto found = line.Complete(words);
  std::string text;
  for (const auto& [word, help] : found.words) text += Format("{}\t{}\n", word, OnOneLine(help));
  if (found.files) text += ":files\n";
  std::fwrite(text.data(), 1, text.size(), stdout);
}

}  // namespace kral::tool
