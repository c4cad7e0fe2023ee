// Reads and carries out the commands of kral sim --script.
#include "tools/kral/sim/sim_script.h"

#include <array>
#include <charconv>
#include <fstream>
#include <iostream>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <utility>

#include "platform/clock.h"
#include "tools/kral/format.h"
#include "tools/kral/sim/sim_faults.h"

namespace kral::tool {
namespace {

using handset::VirtualHandset;

// What is done to one handset, or to all.
struct Deed {
  std::string_view name;
  void (*check)(VirtualHandset& handset, const std::string& words);  // what it takes; null: nothing
  void (*act)(VirtualHandset& handset, const std::string& words);
};

void CheckFault(VirtualHandset&, const std::string& words) {
  handset::FaultPlan unused;
  AddFault(unused, words);
}

std::pair<std::string, std::string> AssignmentOf(const std::string& words) {
  const auto equals = words.find('=');
  return {words.substr(0, equals), equals == std::string::npos ? "" : words.substr(equals + 1)};
}

void CheckAssignment(VirtualHandset& handset, const std::string& words) try {
  const auto dot = words.find('.');
  if (dot == 0 || dot > words.find('=') || words.find('=') == std::string::npos) {
    throw ToolError(ExitCode::kUsage, Format("'{}' is not of the form FAMILY.FIELD=VALUE", words),
                    "for example WLAN.power=-12.5");
  }
  const auto [path, value] = AssignmentOf(words);
  handset.defined().Checked(path, value);
} catch (const std::invalid_argument& error) {
  throw ToolError(ExitCode::kUsage, Format("'{}': {}", words, error.what()),
                  "kral cmd show tells the fields of a reply; --commands names the definition file");
}

constexpr std::array<Deed, 6> kDeeds{{
    {"fault", CheckFault, [](VirtualHandset& handset, const std::string& fault) { AddFault(handset.faults(), fault); }},
    {"heal", nullptr, [](VirtualHandset& handset, const std::string&) { handset.faults().Clear(); }},
    {"plug", nullptr, [](VirtualHandset& handset, const std::string&) { handset.PlugIn(); }},
    {"restart", nullptr, [](VirtualHandset& handset, const std::string&) { handset.Restart(); }},
    {"set", CheckAssignment,
     [](VirtualHandset& handset, const std::string& words) {
       const auto [path, value] = AssignmentOf(words);
       handset.defined().Set(path, value);
     }},
    {"unplug", nullptr, [](VirtualHandset& handset, const std::string&) { handset.HangUp(); }},
}};

// Words with one blank between them, without a comment.
std::string Cleaned(const std::string& line) {
  std::string words;
  bool blank = false;
  for (const char character : line) {
    if (character == '#') break;
    const bool is_blank = character == ' ' || character == '\t' || character == '\r';
    if (!is_blank && blank && !words.empty()) words += ' ';
    if (!is_blank) words += character;
    blank = is_blank;
  }
  return words;
}

std::string TakeWord(std::string& words) {
  auto word = words.substr(0, words.find(' '));
  words.erase(0, word.size() + 1);
  return word;
}

std::optional<std::uint32_t> NumberOf(const std::string& word) {
  std::uint32_t value = 0;
  const auto* const end = word.data() + word.size();
  const auto [rest, error] = std::from_chars(word.data(), end, value);
  return error == std::errc() && rest == end ? std::optional(value) : std::nullopt;
}

struct SimCommand {
  const Deed* deed = nullptr;  // null: wait, quit
  bool quits = false;
  std::uint32_t number = 0;  // of the handset, 0 for all; or milliseconds
  std::string words;         // that the deed takes
};

[[noreturn]] void Reject(const std::string& line) {
  throw ToolError(ExitCode::kUsage, Format("'{}' is no command", line),
                  "kral sim --help lists the commands of --script");
}

SimCommand ParseCommand(const std::string& line, SimFixture& fixture) {
  SimCommand command;
  auto rest = line;
  const auto name = TakeWord(rest);
  const auto where = TakeWord(rest);
  command.words = rest;
  if (name == "quit") {
    command.quits = true;
    return command;
  }
  const auto number = NumberOf(where);
  if (!number && where != "all") Reject(line);
  command.number = number.value_or(0);
  if (name == "wait" && number) return command;
  for (const auto& deed : kDeeds) {
    if (deed.name == name) command.deed = &deed;
  }
  if (command.deed == nullptr || (command.deed->check != nullptr) == rest.empty() ||
      (number && (*number == 0 || *number > fixture.sockets().size())))
    Reject(line);
  // They all answer the same commands.
  if (command.deed->check != nullptr) command.deed->check(fixture.sockets().front().handset(), rest);
  return command;
}

}  // namespace

struct SimScript::Inbox {
  std::mutex mutex;
  std::deque<std::string> lines;
};

SimScript::SimScript(const Output& out, SimFixture& fixture, const std::string& file) : out_(out), fixture_(fixture) {
  if (file == "-") {
    inbox_ = std::make_shared<Inbox>();
    // It cannot be woken from its wait for a line: the end of the process is its end.
    std::thread([inbox = inbox_] {
      for (std::string line; std::getline(std::cin, line);) {
        const std::lock_guard lock(inbox->mutex);
        inbox->lines.push_back(Cleaned(line));
      }
    }).detach();
  } else if (!file.empty()) {
    std::ifstream text(file);
    if (!text) throw ToolError(ExitCode::kBadFile, Format("the script {} cannot be read", file), "check its name");
    for (std::string line; std::getline(text, line);) {
      lines_.push_back(Cleaned(line));
      if (!lines_.back().empty()) ParseCommand(lines_.back(), fixture_);
    }
  }
}

bool SimScript::Run() {
  if (inbox_) {
    const std::lock_guard lock(inbox_->mutex);
    for (auto& line : inbox_->lines) lines_.push_back(std::move(line));
    inbox_->lines.clear();
  }
  while (!lines_.empty()) {
    if (wait_since_ && SystemClock().TickMs() - *wait_since_ < wait_ms_) return true;
    wait_since_.reset();
    const auto line = lines_.front();
    lines_.pop_front();
    if (!line.empty() && !Do(line)) return false;
  }
  return true;
}

bool SimScript::Do(const std::string& line) try {
  const auto command = ParseCommand(line, fixture_);
  if (command.quits) return false;
  if (command.deed == nullptr) {
    wait_since_ = SystemClock().TickMs();
    wait_ms_ = command.number;
  } else {
    for (auto& socket : fixture_.sockets()) {
      if (command.number == 0 || command.number == socket.number()) command.deed->act(socket.handset(), command.words);
    }
  }
  out_.Stream({{"event", "done"}, {"command", line}}, line + "\n");
  return true;
} catch (const ToolError& error) {  // a person may type something else
  out_.Note(error.what());
  return true;
}

std::string SimScript::Describe() {
  return "Commands of --script, one a line; N is the number of a handset, or all:\n"
         "  unplug N, plug N    the device vanishes, and comes back\n"
         "  restart N           power off and on\n"
         "  fault N KIND...     misbehaviour as above; heal N takes all of it away\n"
         "  set N FAMILY.FIELD=VALUE  what replies to commands of --commands hold from now on\n"
         "  wait MS, quit       # and what follows it is a comment\n";
}

}  // namespace kral::tool
