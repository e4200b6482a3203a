// Reads modem pipe records back into words: one line per record for a
// timeline, a field-by-field description for `vtsp decode`, and a whole
// captured stream of records. Byte order is handled here (ports and IPv6
// groups arrive big-endian); every value printed is in host order. Any
// 3664 bytes decode without fault: unknown target modules, codes and types
// are named as such with a hex excerpt.
#ifndef QUELLBORN_TOOLS_RECORDDECODER_H
#define QUELLBORN_TOOLS_RECORDDECODER_H

#include <istream>
#include <ostream>
#include <string>
#include <vector>

#include "VprComm.h"

class RecordDecoder {
public:
    // "START stream 1 sendrecv 10.0.0.1:6000 <-> 192.168.1.2:5000 pt 96"
    static std::string summary(const android::VPR_Comm& record);
    // The header line and the body's fields, one per line.
    static std::vector<std::string> describe(const android::VPR_Comm& record, size_t index);

    struct StreamResult {
        size_t records = 0;
        size_t trailingBytes = 0;  // bytes after the last whole record
    };
    // Decodes every whole record of `in`, then reports trailing bytes. With
    // `stepsOnly`, prints just each record's step text, ready for `vtsp encode`.
    static StreamResult decodeStream(std::istream& in, std::ostream& out, bool stepsOnly = false);

    // "51 00 00 00 01 00 ..." of the first `count` bytes.
    static std::string hexExcerpt(const uint8_t* bytes, size_t count);
    // "0x50 (NACK FIR)": the RTCP feedback bits the link keeps.
    static std::string rtcpMaskText(int16_t mask);
};

#endif  // QUELLBORN_TOOLS_RECORDDECODER_H
