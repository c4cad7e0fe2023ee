// How the library's threads are made. Tests take the system's place here.
#ifndef KRAL_BASE_THREAD_MAKER_H
#define KRAL_BASE_THREAD_MAKER_H

#include <functional>
#include <thread>

namespace kral {

// Throws where there is no thread to be had.
using ThreadMaker = std::function<std::thread(std::function<void()> body)>;

void SetThreadMaker(ThreadMaker maker);  // an empty one: the system's

}  // namespace kral

#endif
