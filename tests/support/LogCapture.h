// Captures the platform log in-process so tests assert exact texts, tags and
// priorities. Built on liblog's logger hook; debug lines are let through.
#ifndef QUELLBORN_TESTS_LOGCAPTURE_H
#define QUELLBORN_TESTS_LOGCAPTURE_H

#include <chrono>
#include <string>
#include <vector>

struct LogLine {
    int priority;
    std::string tag;
    std::string text;
    std::chrono::steady_clock::time_point when;  // when it was logged, not when a test looked
    bool operator==(const LogLine& o) const {
        return priority == o.priority && tag == o.tag && text == o.text;
    }
};

class LogCapture {
public:
    // Installs the capture and forgets earlier lines; the destructor puts
    // liblog's stderr logger back.
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogLine> lines() const;
    std::vector<LogLine> linesWithTag(const std::string& tag) const;
    size_t count(int priority, const std::string& tag, const std::string& text) const;
    bool contains(int priority, const std::string& tag, const std::string& text) const {
        return count(priority, tag, text) > 0;
    }
    // Time between the first two lines with exactly this text, as logged
    // (a slow test thread cannot shorten or stretch it); -1 ms if fewer than two.
    std::chrono::milliseconds firstGap(int priority, const std::string& tag, const std::string& text) const;
    // Waits until `text` has been logged at least `times` times.
    bool waitFor(int priority, const std::string& tag, const std::string& text, size_t times = 1,
                 std::chrono::milliseconds timeout = std::chrono::seconds(10)) const;
    void clear();
    // The next thread that logs exactly this line stops inside that log call
    // until letGo() (or the capture's end): a thread held at a known point.
    void holdAt(int priority, const std::string& tag, const std::string& text);
    void letGo();
};

#endif  // QUELLBORN_TESTS_LOGCAPTURE_H
