// What the command families keep for one handset: an object of each type that is asked for, as long as the phone object
// lives. The types are the families' own, and nothing here knows them.
#ifndef KRAL_FRAME_PHONE_STATE_H
#define KRAL_FRAME_PHONE_STATE_H

#include <atomic>
#include <memory>
#include <utility>

namespace kral {

// For any thread. A look-up waits for nobody: it walks a list of a few entries, to which others are only ever
// prepended.
class PhoneState {
 public:
  PhoneState() = default;
  ~PhoneState() {
    for (Entry* entry = first_; entry != nullptr;) delete std::exchange(entry, entry->next);
  }
  PhoneState(const PhoneState&) = delete;
  PhoneState& operator=(const PhoneState&) = delete;

  // The one T, made on first use. Where two threads are the first, one of their two objects is dropped again.
  template <class T>
  T& Get() {
    Entry* first = first_.load(std::memory_order_acquire);
    if (Entry* entry = Find(first, &key<T>)) return ValueOf<T>(*entry);
    auto made = std::make_unique<EntryOf<T>>();
    made->key = &key<T>;
    do {
      if (Entry* entry = Find(first, &key<T>)) return ValueOf<T>(*entry);
      made->next = first;
    } while (!first_.compare_exchange_weak(first, made.get(), std::memory_order_acq_rel, std::memory_order_acquire));
    return made.release()->value;
  }

 private:
  struct Entry {
    virtual ~Entry() = default;
    const void* key = nullptr;
    Entry* next = nullptr;
  };
  template <class T>
  struct EntryOf final : Entry {
    T value{};
  };
  // Its address tells the type. Not constant, so that no linker makes one of two.
  template <class T>
  static inline char key = 0;

  static Entry* Find(Entry* entry, const void* key) {
    while (entry != nullptr && entry->key != key) entry = entry->next;
    return entry;
  }
  template <class T>
  static T& ValueOf(Entry& entry) {
    return static_cast<EntryOf<T>&>(entry).value;
  }

  std::atomic<Entry*> first_{nullptr};
};

}  // namespace kral

#endif
