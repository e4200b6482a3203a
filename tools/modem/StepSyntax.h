// The one-line step syntax for modem records, shared by `vtsp encode`, the
// simulator's scenarios and the tests:
//
//   start|modify|end stream=N [dir=ended|inactive|sendonly|recvonly|sendrecv|0..4]
//                    [local=IP:PORT] [remote=IP:PORT] [pt=N[,N]] [encoder=N]
//                    [bw=KBPS] [rbw=KBPS] [ext=ID[:URI]] [rtcp-ports=L:R] [type=N]
//   config stream=N rtcp=MASK [on=N] [templ=N] [type=N]
//   raw target=N [type=N] [code=N]
//
// IPv6 addresses are written [ADDR]:PORT (or ADDR:PORT, the last colon
// starting the port). Numbers are decimal or 0x-hexadecimal. `ext=ID` alone
// names urn:3gpp:video-orientation. Parsing never throws: a bad step is
// reported as "expected ... but found ...".
#ifndef QUELLBORN_TOOLS_STEPSYNTAX_H
#define QUELLBORN_TOOLS_STEPSYNTAX_H

#include <istream>
#include <string>
#include <vector>

#include "TokenCursor.h"
#include "VtspRecord.h"

class StepSyntax {
public:
    enum class Kind { kStart, kModify, kEnd, kConfig, kRaw };

    struct Step {
        Kind kind = Kind::kStart;
        vtspcodec::StreamCommand stream;  // start, modify, end
        vtspcodec::ConfigCommand config;  // config
        int32_t rawCode = 0;              // raw: first word of the body
        uint32_t type = 0;                // trailer type
        uint32_t targetModule = 0;        // trailer targetModule (raw only)

        // The 3664-byte record in wire order.
        android::VPR_Comm record() const;
    };

    // One step from the words of `cursor` (which must hold nothing else).
    static bool parse(TokenCursor& cursor, Step* out, std::string* error);
    static bool parse(const std::string& text, Step* out, std::string* error);
    // One step per line; blank lines and '#' comments are skipped. Errors
    // read "line N: expected ... but found ...".
    static bool parseLines(std::istream& in, std::vector<Step>* out, std::string* error);

    // The step a record reads as, and its text. `exact` tells whether that
    // step builds the very same bytes (a record may carry fields that no
    // step key sets).
    static Step fromRecord(const android::VPR_Comm& record);
    static std::string format(const Step& step);
    static bool exact(const android::VPR_Comm& record);

    static const char* usage();
};

#endif  // QUELLBORN_TOOLS_STEPSYNTAX_H
