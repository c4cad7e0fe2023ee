// The log lines with which exported functions begin, and the records that they leave when they fail.
#include "frame/export_call.h"

#include <algorithm>
#include <array>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <exception>

#include "frame/library_state.h"

namespace kral {
namespace {

constexpr size_t kFormattedCapacity = 8016;

}  // namespace

ExportCall::ExportCall(const char* function) noexcept
    : handle_(0), function_(function), name_(function), has_line_(false) {}

ExportCall::ExportCall(KRAL_HANDLE handle, const char* function) noexcept
    : handle_(handle), function_(function), name_(function), phone_(Kral_ResourceManager::GetPhone(handle)) {}

ExportCall::~ExportCall() = default;

ExportCall& ExportCall::Named(const char* name) noexcept {
  name_ = name;
  return *this;
}

ExportCall& ExportCall::Unlogged() noexcept {
  has_line_ = false;
  return *this;
}

ExportCall& ExportCall::Answering() noexcept {
  answering_ = true;
  return *this;
}

ExportCall& ExportCall::Logged(const char* format, ...) {
  has_line_ = false;
  if (!phone_ || !phone_->log().logging_started() || !phone_->log().Wants(kLogHighLevelStart)) return *this;
  std::array<char, kFormattedCapacity> text;
  va_list arguments;
  va_start(arguments, format);
  const int formatted = std::vsnprintf(text.data(), text.size(), format, arguments);
  va_end(arguments);
  if (formatted >= 0) WriteEntry(text.data());
  return *this;
}

ExportCall& ExportCall::Require(bool holds, const char* otherwise) noexcept {
  if (!holds) otherwise_ = otherwise;
  return *this;
}

Failure UnknownHandle(KRAL_HANDLE handle) {
  return Failure(KRAL_ERROR_ARGUMENT, "the handle 0x%X is not one of a connection", static_cast<unsigned>(handle));
}

bool ExportCall::Begin() {
  if (!phone_) {
    uint16_t port = 0;
    Fail(Kral_ResourceManager::PortOf(handle_, port)
             ? Failure(KRAL_ERROR_NO_PORT, "there is no phone server for port %d", port)
             : UnknownHandle(handle_));
    Failed();
    return false;
  }
  WriteName();
  return IsPermitted();
}

void ExportCall::WriteName() {
  if (phone_ && has_line_) WriteEntry("");
}

// The caller's thread may end in the callback of its text log.
void ExportCall::WriteEntry(const char* rest) {
  try {
    phone_->log().WriteLine(kLogHighLevelStart, "%s%s", name_, rest);
  } catch (...) {
    PassForcedUnwind();
  }
}

bool ExportCall::IsPermitted() noexcept {
  if (otherwise_ == nullptr) return true;
  Fail(Failure(KRAL_ERROR_ARGUMENT, "%s", otherwise_));
  Failed();
  return false;
}

void ExportCall::Failed() noexcept {
  if (!failure_.noted()) {
    if (answering_) return;
    Fail(Failure(KRAL_ERROR_INTERNAL, "%s failed; the text log may say why", function_));
  }
  KRAL_ERROR record = failure_.record();
  const size_t length = std::min(std::strlen(function_), sizeof record.function - 1);
  std::copy_n(function_, length, record.function);
  record.function[length] = '\0';
  Library().last_errors.Note(handle_, record);
}

void ExportCall::Threw() noexcept {
  try {
    throw;
  } catch (const std::bad_alloc&) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "no memory"));
  } catch (const std::exception& exception) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "%s", exception.what()));
  } catch (...) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "an unknown exception"));
  }
  Failed();
}

}  // namespace kral
