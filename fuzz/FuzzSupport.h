// What every fuzz target needs before its first input: the system's log
// lines dropped (formatting them to stderr would dominate each run).
#ifndef QUELLBORN_FUZZ_FUZZSUPPORT_H
#define QUELLBORN_FUZZ_FUZZSUPPORT_H

#include <android/log.h>

namespace fuzzsupport {

inline void discardLog(const struct __android_logger_data* /*data*/, const char* /*message*/) {}

inline void quietLog() {
    __android_log_set_logger(discardLog);
}

}  // namespace fuzzsupport

#endif  // QUELLBORN_FUZZ_FUZZSUPPORT_H
