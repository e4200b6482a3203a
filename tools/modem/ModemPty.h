// A pseudo-terminal in raw mode standing in for the modem pipe: the system
// opens the slave side by path, the test plays the modem on the master side.
#ifndef QUELLBORN_TOOLS_MODEMPTY_H
#define QUELLBORN_TOOLS_MODEMPTY_H

#include <chrono>
#include <cstddef>
#include <string>

#include "VprComm.h"

class ModemPty {
public:
    ModemPty();
    ~ModemPty();
    ModemPty(const ModemPty&) = delete;
    ModemPty& operator=(const ModemPty&) = delete;

    // Path of the device the system opens.
    const char* devicePath() const { return mSlaveName.c_str(); }
    int masterFd() const { return mMaster; }

    // Writes a record as the modem would; `chunk` below 3664 splits it into
    // several short writes with a pause between them, so the reader sees
    // short reads.
    void writeRecord(const android::VPR_Comm& record, size_t chunk = android::kVprCommSize,
                     std::chrono::milliseconds pause = std::chrono::milliseconds(0));
    void writeBytes(const void* data, size_t size);

    // Reads one whole record written by the system; false if none arrives
    // in time.
    bool readRecord(android::VPR_Comm* out,
                    std::chrono::milliseconds timeout = std::chrono::seconds(5));
    // True if the system writes nothing at all within `window`.
    bool silentFor(std::chrono::milliseconds window);

    // Closes the master: the system's reads then fail (EIO) until it is gone.
    void closeMaster();

private:
    int mMaster = -1;
    int mSlaveKeepAlive = -1;
    std::string mSlaveName;
};

#endif  // QUELLBORN_TOOLS_MODEMPTY_H
