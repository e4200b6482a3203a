// A logger that costs what a handset's does: each line leaves the calling
// thread as one writev (header, priority, tag, text) into a datagram socket,
// and another thread drains the socket, as the log daemon does on a device.
#ifndef QUELLBORN_BENCH_HANDSETLOGGER_H
#define QUELLBORN_BENCH_HANDSETLOGGER_H

#include <android/log.h>

#include <thread>

class HandsetLogger {
public:
    // Installs itself as liblog's logger; the destructor installs `previous`.
    explicit HandsetLogger(__android_logger_function previous);
    ~HandsetLogger();
    HandsetLogger(const HandsetLogger&) = delete;
    HandsetLogger& operator=(const HandsetLogger&) = delete;

private:
    static void log(const struct __android_logger_data* data, const char* message);
    void drain();

    __android_logger_function mPrevious;
    int mWriter = -1;
    int mReader = -1;
    std::thread mDrainer;
};

#endif  // QUELLBORN_BENCH_HANDSETLOGGER_H
