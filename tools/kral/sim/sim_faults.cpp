// Reads the faults of `kral sim --fault`; what a fault does is the handset's business.
#include "tools/kral/sim/sim_faults.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <optional>
#include <string_view>

#include "tools/kral/exit_codes.h"
#include "tools/kral/format.h"
#include "tools/kral/numbers.h"

namespace kral::tool {
namespace {

using handset::Fault;
using handset::When;

struct Kind {
  std::string_view name;
  std::string_view value;  // what the value is; empty where there is none
  Fault (*make)(std::uint32_t value);
  std::string_view meaning;
};

constexpr std::array<Kind, 14> kKinds{{
    {"corrupt", "", [](std::uint32_t) { return handset::Corrupt(); }, "wrong frame check"},
    {"delay", "ms", [](std::uint32_t value) { return handset::Delay(value); }, "late reply"},
    {"duplicate", "", [](std::uint32_t) { return handset::Duplicate(); }, "the reply comes twice"},
    {"hang-up", "", [](std::uint32_t) { return handset::HangUp(); }, "the device vanishes"},
    {"ignore", "", [](std::uint32_t) { return handset::Ignore(); }, "the request is not carried out: silence"},
    {"lag", "ms", [](std::uint32_t value) { return handset::Lag(value); }, "slow worker: late, and in order"},
    {"late", "", [](std::uint32_t) { return handset::AfterNextRequest(); }, "the reply comes after the next request"},
    {"lose", "", [](std::uint32_t) { return handset::Lose(); }, "carried out, but the reply is gone"},
    {"merge", "", [](std::uint32_t) { return handset::Merge(); }, "the reply is read together with the next one"},
    {"noise", "bytes", [](std::uint32_t value) { return handset::LeadingNoise(value); },
     "bytes of no meaning in front"},
    {"refuse", "code", [](std::uint32_t value) { return handset::Refuse(static_cast<std::uint8_t>(value)); },
     "refused with 19, 20, 21 or 24"},
    {"repeat", "", [](std::uint32_t) { return handset::Repeat(); }, "the reply comes again after the next request"},
    {"split", "bytes", [](std::uint32_t value) { return handset::Split(value); }, "the reply comes in pieces"},
    {"wrong", "code", [](std::uint32_t value) { return handset::WrongCode(static_cast<std::uint8_t>(value)); },
     "another first byte"},
}};
static_assert(std::ranges::is_sorted(kKinds,
                                     [](const Kind& left, const Kind& right) { return left.name < right.name; }));

[[noreturn]] void Reject(const std::string& words, const std::string& why) {
  throw ToolError(ExitCode::kUsage, Format("--fault {}: {}", words, why),
                  "kral sim --help lists the faults; for example --fault refuse=19,of=7C");
}

// One "name=value" of the words, in order.
struct Word {
  std::string_view name;
  std::string_view value;
};

Word TakeWord(std::string_view& rest) {
  const auto word = rest.substr(0, rest.find(','));
  rest.remove_prefix(std::min(rest.size(), word.size() + 1));
  const auto equals = word.find('=');
  if (equals == std::string_view::npos) return {word, {}};
  return {word.substr(0, equals), word.substr(equals + 1)};
}

std::optional<When> ParseWhen(const Word& word) {
  if (word.name == "chance") {
    double probability = 0;
    const auto* last = word.value.data() + word.value.size();
    const auto [end, error] = std::from_chars(word.value.data(), last, probability);
    if (error != std::errc() || end != last || probability < 0 || probability > 1) return std::nullopt;
    return When::Chance(probability);
  }
  const auto number = ParseNumber<std::uint32_t>(word.value);
  if (!number || *number == 0) return std::nullopt;
  if (word.name == "nth") return When::Nth(*number);
  if (word.name == "from") return When::From(*number);
  if (word.name == "every") return When::Every(*number);
  return std::nullopt;
}

Fault ParseKind(const std::string& words, const Word& word) {
  const auto kind = std::ranges::find_if(kKinds, [&word](const Kind& known) { return known.name == word.name; });
  if (kind == kKinds.end()) Reject(words, Format("there is no fault '{}'", word.name));
  if (kind->value.empty()) {
    if (!word.value.empty()) Reject(words, Format("{} takes no value", kind->name));
    return kind->make(0);
  }
  const auto value = ParseNumber<std::uint32_t>(word.value);
  if (!value || (kind->value == "code" && *value > 0xFF)) {
    Reject(words, Format("{} needs a value, {}={}", kind->name, kind->name, kind->value));
  }
  return kind->make(*value);
}

}  // namespace

void AddFault(handset::FaultPlan& faults, const std::string& words) {
  std::string_view rest = words;
  const auto fault = ParseKind(words, TakeWord(rest));
  auto when = When::Always();
  std::string prefix;
  std::size_t longer_than = 0;
  while (!rest.empty()) {
    const auto word = TakeWord(rest);
    if (word.name == "longer") {
      const auto bytes = ParseNumber<std::uint32_t>(word.value);
      if (!bytes || *bytes == 0) Reject(words, "longer needs a number of bytes, longer=2100");
      longer_than = *bytes;
      continue;
    }
    if (word.name == "of") {
      prefix = word.value;
      continue;
    }
    const auto parsed = ParseWhen(word);
    if (!parsed) Reject(words, Format("'{}={}' does not say when", word.name, word.value));
    when = *parsed;
  }
  when = when.LongerThan(longer_than);
  try {
    faults.Add(fault, prefix.empty() ? when : when.Of(prefix));
  } catch (const std::invalid_argument&) {
    Reject(words, Format("of={} is not hex", prefix));
  }
}

std::string DescribeFaults() {
  std::string text =
      "Faults of the simulated handset, KIND[=VALUE][,nth=N|from=N|every=N|chance=P][,of=HEX][,longer=BYTES]:\n";
  for (const auto& kind : kKinds) {
    const auto written = kind.value.empty() ? std::string(kind.name) : Format("{}={}", kind.name, kind.value);
    text += Format("  {:<14}{}\n", written, kind.meaning);
  }
  return text +
         "Without nth, from, every or chance a fault strikes always; of=HEX limits it to requests that begin so.\n";
}

}  // namespace kral::tool
