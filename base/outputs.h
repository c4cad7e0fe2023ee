// Filling callers' outputs: a null output is one the caller does not want.
#ifndef KRAL_BASE_OUTPUTS_H
#define KRAL_BASE_OUTPUTS_H

namespace kral {

template <class T>
void Put(T* output, T value) {
  if (output != nullptr) *output = value;
}

}  // namespace kral

#endif
