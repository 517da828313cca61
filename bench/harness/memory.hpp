// The memory of the process: what it holds, and that it holds on to it.
#pragma once

namespace sm::bench {

// Everybody's freed memory stays with the process from here on: that of the C library, as the module's host is told for
// its own (Module). A virtual machine may give memory that nobody uses back to its host within a second, and get it
// again, page by page, only when it is touched: at seconds a gigabyte, which would fall on whoever takes most anew.
void keep_freed_memory();

// "VmHWM" (the peak) or "VmRSS" of the process in bytes; 0 when the system does not say.
double resident(const char* what);
// The peak is what is in use now from here on. False when the system does not allow it.
bool forget_peak();

}  // namespace sm::bench
