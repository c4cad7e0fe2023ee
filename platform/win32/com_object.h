// An owned reference to a COM object.
#ifndef KRAL_PLATFORM_WIN32_COM_OBJECT_H
#define KRAL_PLATFORM_WIN32_COM_OBJECT_H

#include <objbase.h>

#include <memory>

namespace kral {

struct ReleaseObject {
  void operator()(IUnknown* object) const { object->Release(); }
};
template <class T>
using Owned = std::unique_ptr<T, ReleaseObject>;

}  // namespace kral

#endif
