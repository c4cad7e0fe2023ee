// Whether the chains of a compound document end. The systems' readers follow them on trust, and some for ever.
#ifndef KRAL_PLATFORM_COMPOUND_CHAINS_H
#define KRAL_PLATFORM_COMPOUND_CHAINS_H

#include <cstdint>
#include <span>

namespace kral {

// False when the allocation tables, the directory, its tree or a stream's sectors run in a circle, meet one another or
// lead out of the file. Bytes that are no compound document at all pass: the reader itself tells those.
bool CompoundChainsEnd(std::span<const uint8_t> file);

}  // namespace kral

#endif
