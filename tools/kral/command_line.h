// The command line as the verbs declare it: nouns, verbs, their options, and what they run. The parser itself is known
// to command_line.cpp only.
#ifndef KRAL_TOOLS_COMMAND_LINE_H
#define KRAL_TOOLS_COMMAND_LINE_H

#include <cstdint>
#include <functional>
#include <initializer_list>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace kral::tool {

// What is known of a command line behind its parsing.
struct Chosen;

// What a number may be, and what it counts: "ms". What a type of its own cannot hold it may not be either.
struct NumberRange {
  double least;
  double most;
  const char* unit = "";
};

// What a word may be, and what that means.
struct Completion {
  std::string word;
  std::string help;
};
struct Completions {
  std::vector<Completion> words;
  bool files = false;  // names of files as well
};
// Asked with the words of a line that is being typed, of which the last may be unfinished; of --name=value only the
// value is in it.
using Suggest = std::function<std::vector<Completion>(const std::vector<std::string>& words)>;

// An option or an argument, for whatever else is to be said of it.
class Option {
 public:
  Option& Required();
  Option& Between(double least, double most, const char* unit = "");  // of a number
  Option& OneOf(std::initializer_list<std::string> words);            // of a text
  Option& ShowDefault();                                              // in the help: the value that the target has now
  // Of a list. Without these the values of an option may follow each other: --on 0x1001 0x1002.
  Option& OneEach();           // every value has the option in front of it
  Option& Separated(char by);  // values in one word
  Option& Count(int least, int most);
  // Of a list whose values mean different things: how the line of usage has them, "LOCAL... :PATH".
  Option& Usage(const char* words);
  // Of a text, or a list of them: names of files, in which {port}, {serial}, {model} and {slot} stand for the
  // handset's.
  Option& File();
  // What is settled of that name (settings.h), where the option is not given. `unless`: nor that other one.
  Option& Settled(const char* name, const char* unless = nullptr);
  Option& Suggests(Suggest suggest);
  // Gives what is wrong with a text; nothing when it is right.
  Option& Check(std::function<std::string(const std::string&)> fault);

 private:
  friend class Command;
  Option(CLI::App* app, Chosen* chosen, CLI::Option* option, std::string default_text, std::shared_ptr<bool> is_file)
      : app_(app),
        chosen_(chosen),
        option_(option),
        default_text_(std::move(default_text)),
        is_file_(std::move(is_file)) {}

  CLI::App* app_;
  Chosen* chosen_;

  CLI::Option* option_;
  std::shared_ptr<NumberRange> range_;
  std::string default_text_;
  std::shared_ptr<bool> is_file_;
};

// A noun or a verb. A handle: copies are the same noun or verb.
class Command {
 public:
  Command Noun(const std::string& name, const std::string& help) const;  // takes one of its verbs
  Command Verb(const std::string& name, const std::string& help) const;
  Command Find(const std::string& name) const;  // a noun or verb that was added before

  // Options ("--names", "-p,--port") and arguments ("file"), which are taken in the order of their declaration. The
  // target must live as long as the verb may run. Numbers are decimal, or hexadecimal with 0x in front.
  Option Add(const char* names, std::string& target, std::string_view help = "") const;
  Option Add(const char* names, std::vector<std::string>& target, std::string_view help = "") const;
  Option Add(const char* names, std::vector<std::pair<std::string, std::string>>& target, std::string_view help) const;
  Option Add(const char* names, std::vector<std::uint16_t>& target, std::string_view help) const;
  // Of the number types and std::optional of them; command_line.cpp lists those in use.
  template <class Number>
  Option Add(const char* names, Number& target, std::string_view help) const;
  void Flag(const char* names, bool& target, std::string_view help) const;
  void Flag(const char* names, std::function<void()> given, std::string_view help) const;

  // What the verb does, when it is the one that was given.
  void Run(std::function<void()> act) const;
  // The verb may be given several handsets: it runs for each of them, with a command line of its own.
  void ForMany() const;
  // The same for handsets in download, which are not asked who they are. A boot loader is not asked at all.
  enum class InDownload { kMayBeAsked, kBootLoader };
  void ForMany(InDownload who) const;
  // The verb takes the ports, however many, as they are: it runs once.
  void TakesPorts() const;
  // It needs none, always or when that is true: what is settled for handsets is not for it.
  void NeedsNoHandset(std::function<bool()> is_so = {}) const;
  // It looks for no port, always or when that is true: the ports stay as they were named, and it runs once.
  void AsksNobody(std::function<bool()> is_so = {}) const;
  // The words behind that option of its own, as they were on the command line.
  std::vector<std::string> Given(const char* option) const;
  // Which local files it writes, asked behind the parsing: no two handsets may write the same.
  void Writes(std::function<std::vector<std::string>()> files) const;
  // Which it reads: they must be there before the work begins on any handset.
  void Reads(std::function<std::vector<std::string>()> files) const;
  // What can be wrong with its words alone: a ToolError of this is told once, before several handsets are asked.
  void Checks(std::function<void()> check) const;
  // Below the options in the help.
  void Explain(std::function<std::string()> text) const;

 private:
  friend class CommandLine;
  using Sink = std::function<void(const std::vector<std::string>& words)>;

  Command(CLI::App& app, Chosen& chosen) : app_(&app), chosen_(&chosen) {}
  Option AddWords(const char* names, Sink sink, std::string_view help, std::string default_text) const;
  template <class Number>
  Option AddNumbers(const char* names, std::string_view help, std::function<void(Number)> set,
                    const std::string& now) const;

  CLI::App* app_;
  Chosen* chosen_;
};

// What "port", "serial", ... stand for in the names of files.
using Names = std::map<std::string, std::string>;

class CommandLine {
 public:
  CommandLine(const std::string& program, const std::string& description, std::function<std::string()> version);
  ~CommandLine();
  CommandLine(const CommandLine&) = delete;
  CommandLine& operator=(const CommandLine&) = delete;

  Command root();
  // Shown at the end of the help of its verb: "kral -p 7 info". Its verb and its options must be there.
  void Example(const std::string& words);
  // What the chosen verb does; nothing when help or the version was asked for, which is then printed. ToolError for
  // mistakes. Options of a noun or of the root are taken behind a verb, too.
  std::function<void()> Parse(const std::vector<std::string>& arguments);
  // What may stand in the place of the last word, as far as it begins with it.
  Completions Complete(const std::vector<std::string>& words);
  void SetNames(Names names);  // before it; without, names of files stay as they are

  // --- Of the verb that was chosen ---
  std::string verb() const;  // "nv backup"
  bool for_many() const;
  bool takes_ports() const;
  bool asks_nobody() const;
  bool needs_no_handset() const;
  bool asks_identity() const;
  bool may_ask_all() const;
  const std::vector<std::string>& words() const;  // of its own texts, names of files as they are now
  void Check() const;
  std::vector<std::string> Read() const;
  std::vector<std::string> Written() const;    // local files, as far as it has said so
  const std::set<std::string>& asked() const;  // which names were asked for: "serial"

 private:
  struct Parser;
  std::unique_ptr<Parser> parser_;
};

}  // namespace kral::tool

#endif
