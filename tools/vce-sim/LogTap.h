// Takes the platform log for the simulator while it lives: every line goes
// to the timeline (shown with -v) and is kept for `expect log`. Debug lines
// are let through. The destructor puts liblog's stderr logger back.
#ifndef QUELLBORN_TOOLS_VCESIM_LOGTAP_H
#define QUELLBORN_TOOLS_VCESIM_LOGTAP_H

#include <mutex>
#include <string>
#include <vector>

#include "Timeline.h"

class LogTap {
public:
    explicit LogTap(Timeline* timeline);
    ~LogTap();
    LogTap(const LogTap&) = delete;
    LogTap& operator=(const LogTap&) = delete;

    // "I VideoCallEngineImpl: release": the lines from index `from` on.
    std::vector<std::string> linesSince(size_t from) const;
    size_t lineCount() const;

private:
    static void logger(const struct __android_logger_data* data, const char* message);
    void take(int priority, const char* tag, const char* message);

    Timeline* const mTimeline;
    mutable std::mutex mLock;
    std::vector<std::string> mLines;
};

#endif  // QUELLBORN_TOOLS_VCESIM_LOGTAP_H
