// Texts that callers hand over.
#ifndef KRAL_BASE_TEXT_ARGUMENT_H
#define KRAL_BASE_TEXT_ARGUMENT_H

namespace kral {

// A text that was left out counts as an empty one.
inline const char* TextOrEmpty(const char* text) {
  return text == nullptr ? "" : text;
}

}  // namespace kral

#endif
