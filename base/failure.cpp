// Keeps what was said of the exported call under way on each thread. Which record a caller gets to see is
// frame/last_error.cpp's.
#include "base/failure.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "base/utf8_text.h"

namespace kral {
namespace {

// Only that thread's: without a lock.
thread_local CallFailure* call_under_way = nullptr;

struct Phrase {
  uint32_t code;
  std::string_view text;
};
constexpr Phrase kPhrases[] = {
    {KRAL_ERROR_NONE, "no failure"},
    {KRAL_ERROR_INTERNAL, "internal error"},
    {KRAL_ERROR_ARGUMENT, "bad argument or state"},
    {KRAL_ERROR_NO_PORT, "no such port"},
    {KRAL_ERROR_PORT_IN_USE, "port in use or not permitted"},
    {KRAL_ERROR_NO_ANSWER, "no answer in time"},
    {KRAL_ERROR_LINK, "link error"},
    {KRAL_ERROR_REFUSED, "refused by the handset"},
    {KRAL_ERROR_MISMATCH, "comparison found a difference"},
    {KRAL_ERROR_LOST, "the handset went away"},
    {KRAL_ERROR_BAD_FILE, "a file cannot be used"},
    {KRAL_ERROR_SAFETY_STOP, "stopped before doing harm"},
    {KRAL_ERROR_ABORTED, "aborted by the caller"},
};

}  // namespace

Failure::Failure(uint32_t code, const char* format, ...) {
  record_.code = code;
  va_list arguments;
  va_start(arguments, format);
  std::vsnprintf(record_.text, sizeof record_.text, format, arguments);
  va_end(arguments);
  MakePrintableUtf8(record_.text);
}

Failure& Failure::Status(uint32_t kind, uint32_t status) {
  record_.status_kind = kind;
  record_.status = status;
  return *this;
}

Failure& Failure::System(uint32_t error) {
  record_.system_error = error;
  return *this;
}

Failure& Failure::System(const std::error_code& error) {
  return System(static_cast<uint32_t>(error.value()));
}

Failure& Failure::Command(std::span<const uint8_t> request) {
  record_.present |= KRAL_ERROR_HAS_COMMAND;
  record_.command = 0;
  for (size_t i = 0; i < std::min(request.size(), sizeof record_.command); ++i) {
    record_.command |= uint32_t{request[i]} << (8 * i);
  }
  return *this;
}

Failure& Failure::Offset(uint64_t offset) {
  record_.present |= KRAL_ERROR_HAS_OFFSET;
  record_.offset = offset;
  return *this;
}

Failure& Failure::Line(uint32_t line) {
  record_.present |= KRAL_ERROR_HAS_LINE;
  record_.line = line;
  return *this;
}

bool Fail(const Failure& failure) noexcept {
  CallFailure* const call = call_under_way;
  if (call == nullptr || call->keepers_ != 0) return false;
  call->record_ = failure.record();
  call->noted_ = true;
  return false;
}

uint32_t NotedFailure() noexcept {
  return call_under_way != nullptr && call_under_way->noted() ? call_under_way->record().code : KRAL_ERROR_NONE;
}

Failure FileFailure(std::string_view file, const char* what, uint32_t system_error) {
  return Failure(KRAL_ERROR_BAD_FILE, "the file %.*s %s", static_cast<int>(std::min<size_t>(file.size(), 200)),
                 file.data(), what)
      .System(system_error);
}

KeepFailure::KeepFailure() noexcept : keeps_(call_under_way != nullptr && call_under_way->noted_) {
  if (keeps_) ++call_under_way->keepers_;
}

KeepFailure::~KeepFailure() {
  if (keeps_) --call_under_way->keepers_;
}

FailureMark::FailureMark() noexcept : noted_(NotedFailure() != KRAL_ERROR_NONE) {
  if (noted_) record_ = call_under_way->record_;
}

void FailureMark::GoBack() const noexcept {
  if (call_under_way == nullptr || call_under_way->keepers_ != 0) return;
  call_under_way->noted_ = noted_;
  if (noted_) call_under_way->record_ = record_;
}

CallFailure::CallFailure() noexcept : outer_(call_under_way) {
  call_under_way = this;
}

CallFailure::~CallFailure() {
  call_under_way = outer_;
}

std::string_view ErrorPhrase(uint32_t code) {
  const auto* const phrase = std::ranges::find(kPhrases, code, &Phrase::code);
  return phrase == std::end(kPhrases) ? std::string_view() : phrase->text;
}

}  // namespace kral
