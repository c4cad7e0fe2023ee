// Processes of the machine, as far as the library touches them.
#ifndef KRAL_PLATFORM_PROCESS_H
#define KRAL_PLATFORM_PROCESS_H

namespace kral {

// Ends the first running process whose executable name equals `executable`; does nothing when there is none.
void TerminateProcessByName(const char* executable);

}  // namespace kral

#endif
