// Compares requests with the script and keeps a readable account of what differed.
#include "handset/line/script.h"

#include <algorithm>
#include <iterator>

namespace kral::handset {
namespace {

constexpr size_t kEqual = SIZE_MAX;

std::string_view Trim(std::string_view text) {
  while (!text.empty() && text.back() == ' ') text.remove_suffix(1);
  while (!text.empty() && text.front() == ' ') text.remove_prefix(1);
  return text;
}

}  // namespace

Script::Step& Script::Step::Refuse(Refusal refusal) {
  Bytes reply{static_cast<uint8_t>(refusal)};
  {
    const std::lock_guard lock(script_.mutex_);
    const Bytes& request = script_.entries_[index_].expected;
    reply.insert(reply.end(), request.begin(), request.end());
  }
  return Add({std::move(reply), true});
}

Script::Step& Script::Step::Add(ScriptedReply reply) {
  const std::lock_guard lock(script_.mutex_);
  script_.entries_[index_].replies.push_back(std::move(reply));
  return *this;
}

Script::Step Script::Expect(std::string_view hex) {
  constexpr std::string_view kAnyRest = "...";
  Entry entry;
  hex = Trim(hex);
  if (hex.ends_with(kAnyRest)) {
    entry.any_rest = true;
    hex = Trim(hex.substr(0, hex.size() - kAnyRest.size()));
  }
  std::string known(hex);
  known.erase(std::remove(known.begin(), known.end(), ' '), known.end());
  for (size_t i = 0; i + 1 < known.size(); i += 2) {
    const bool any = known[i] == '?' && known[i + 1] == '?';
    entry.any.push_back(any);
    if (any) known[i] = known[i + 1] = '0';
  }
  entry.expected = FromHex(known);

  const std::lock_guard lock(mutex_);
  entries_.push_back(std::move(entry));
  return Step(*this, entries_.size() - 1);
}

bool Script::Consumed() const {
  const std::lock_guard lock(mutex_);
  return next_ == entries_.size() && problems_.empty();
}

std::string Script::Problems() const {
  const std::lock_guard lock(mutex_);
  std::string text = problems_;
  if (next_ < entries_.size()) {
    text += std::string("never asked: ") + std::to_string(entries_.size() - next_) + " of " +
            std::to_string(entries_.size()) + " requests, the first of them\n" + HexDump(entries_[next_].expected);
  }
  return text;
}

Script::Outcome Script::Match(ByteView request, std::vector<ScriptedReply>& replies) {
  const std::lock_guard lock(mutex_);
  if (next_ == entries_.size()) return Outcome::kNoScript;
  const Entry& entry = entries_[next_++];
  const size_t difference = FirstDifference(entry, request);
  if (difference == kEqual) {
    replies = entry.replies;
    return Outcome::kMatched;
  }
  problems_ += std::string("request ") + std::to_string(next_) + " differs at offset " + std::to_string(difference) +
               "; awaited " + std::to_string(entry.expected.size()) +
               (entry.any_rest ? " bytes or more\n" : " bytes\n") + HexDump(entry.expected) + "but got " +
               std::to_string(request.size()) + " bytes\n" + HexDump(request);
  return Outcome::kMismatch;
}

size_t Script::FirstDifference(const Entry& entry, ByteView request) {
  const size_t common = std::min(entry.expected.size(), request.size());
  for (size_t i = 0; i < common; ++i) {
    if (!entry.any[i] && entry.expected[i] != request[i]) return i;
  }
  const bool size_fits = request.size() == common && entry.expected.size() == common;
  const bool rest_fits = entry.any_rest && entry.expected.size() == common;
  return size_fits || rest_fits ? kEqual : common;
}

}  // namespace kral::handset
