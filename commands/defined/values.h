// The values of a message's fields: set by a caller before they are encoded, or read from a reply.
#ifndef KRAL_COMMANDS_DEFINED_VALUES_H
#define KRAL_COMMANDS_DEFINED_VALUES_H

#include <array>
#include <cstdint>
#include <span>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "commands/defined/definition.h"

namespace kral::defined {

// What a caller gave cannot be sent, or what a handset sent is not what was defined. The text says which field and why.
class BadCall : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

class Values {
 public:
  explicit Values(const Message& message) : message_(&message), slots_(message.slots.size()) {}

  const Message& message() const { return *message_; }

  // Null where there is none.
  const Bits* Number(uint32_t slot, uint32_t element) const;
  const std::string* Bytes(uint32_t slot, uint32_t element) const;
  // Behind the last element of [from, to) that has a value, counted from `from`: 0 where none has one.
  uint32_t Reach(uint32_t slot, uint32_t from, uint32_t to) const;
  uint32_t set_count() const { return set_count_; }

  // The element must be below the slot's capacity. BadCall for more elements in all than are kept.
  void SetNumber(uint32_t slot, uint32_t element, Bits value);
  void SetBytes(uint32_t slot, uint32_t element, std::string value);
  void Clear(uint32_t slot);
  void Clear(uint32_t slot, uint32_t from, uint32_t to);
  // What many elements took is given back.
  void Clear();

 private:
  struct Slot {
    std::vector<Bits> numbers;
    std::vector<std::string> bytes;
    std::vector<bool> is_set;
  };

  bool IsSet(uint32_t slot, uint32_t element) const {
    return slot < slots_.size() && element < slots_[slot].is_set.size() && slots_[slot].is_set[element];
  }
  void Reserve(uint32_t slot, uint32_t element);
  void Mark(uint32_t slot, uint32_t element);

  const Message* message_;
  std::vector<Slot> slots_;
  uint32_t set_count_ = 0;
  uint32_t room_ = 0;  // elements that there is memory for, those without a value included
};

// How many of a field's elements have values, or of a group's have some within, up to the last that has: of `elements`
// that begin at `first`.
uint32_t Reach(const Values& values, const Field& field, uint32_t first, uint32_t elements);

// The element of each group around a field, by depth.
using Elements = std::array<uint32_t, 20>;

// BadCall for a number that may not be sent.
void CheckRange(const Field& field, Bits value);
// Sets a value after a look at the field's range.
void SetChecked(Values& values, const Field& field, uint32_t element, Bits value);
void SetChecked(Values& values, const Field& field, uint32_t element, std::string bytes);

// "points[2].level=7 name=\"a b\" list=1,2,3 data=00FF": sets what the text names. BadCall for unknown fields and for
// values that may not be sent.
void Assign(std::string_view text, Values& values);

// The slot of a path without element numbers; null for no field that has a value.
const Field* FindSlot(const Message& message, std::string_view path);

// --- Bytes ----------------------------------------------------------------------------------------------------------

// The bytes of the message. BadCall for a value that is missing, or that has no place in it.
std::vector<uint8_t> Encode(const Values& values);

// A reply whose status field holds none of the values that mean success.
class RefusedByStatus : public std::runtime_error {
 public:
  RefusedByStatus(const std::string& text, Bits status) : std::runtime_error(text), status_(status) {}
  Bits status() const { return status_; }

 private:
  Bits status_;
};

// Takes the values out of the bytes. BadCall for bytes that are not the message, RefusedByStatus for its status.
// `padded`: what stands behind the fields does not matter.
void Decode(std::span<const uint8_t> bytes, Values& values, bool padded = false);

// Whether a field with a condition is in the message that the values make.
bool IsThere(const Condition& condition, const Values& values, const Elements& elements);

}  // namespace kral::defined

#endif
