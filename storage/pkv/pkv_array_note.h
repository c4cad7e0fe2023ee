// The note of arrays among the properties of a PKV file.
#ifndef KRAL_STORAGE_PKV_PKV_ARRAY_NOTE_H
#define KRAL_STORAGE_PKV_PKV_ARRAY_NOTE_H

#include <cstdint>
#include <optional>
#include <set>

#include "storage/pkv/phone_storage_file.h"

namespace kral::pkv {

// Notes which ids are arrays, as "3101,3102": an element 0 alone looks like a plain item.
void NoteArrays(const std::set<uint16_t>& ids, PkvProperties& properties);

// The ids of that note; nothing where there is none.
std::optional<std::set<uint16_t>> NotedArrays(const PkvProperties& properties);

}  // namespace kral::pkv

#endif
