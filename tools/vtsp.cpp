// vtsp: the modem pipe's records as text and back.
//
//   vtsp decode [--steps] [FILE|-]      every 3664-byte record, decoded
//   vtsp encode [-o FILE] [STEP ...]    records from steps (stdin: one per line)
#include <unistd.h>

#include <cstring>
#include <fstream>
#include <iostream>
#include <sstream>
#include <string>
#include <vector>

#include "RecordDecoder.h"
#include "StepSyntax.h"

namespace {

constexpr int kUsageError = 2;

int usage(std::ostream& out, int status) {
    out << "usage: vtsp decode [--steps] [FILE|-]\n"
           "       vtsp encode [-o FILE] [STEP ...]\n"
           "\n"
           "decode reads a stream of 3664-byte modem pipe records (a captured dump) and prints\n"
           "each one; --steps prints only each record's step, ready for `vtsp encode`.\n"
           "A length that is not a multiple of 3664 is reported and exits with status 1.\n"
           "\n"
           "encode builds records from steps (each STEP one argument, or one per line on\n"
           "stdin) and writes them to FILE or to a non-terminal stdout. Steps:\n"
        << StepSyntax::usage();
    return status;
}

int decode(const std::vector<std::string>& args) {
    bool stepsOnly = false;
    std::string path = "-";
    for (const std::string& arg : args) {
        if (arg == "--steps") {
            stepsOnly = true;
        } else if (arg == "-h" || arg == "--help") {
            return usage(std::cout, 0);
        } else {
            path = arg;
        }
    }
    std::ifstream file;
    if (path != "-") {
        file.open(path, std::ios::binary);
        if (!file) {
            std::cerr << "vtsp: cannot open " << path << ": " << strerror(errno) << "\n";
            return kUsageError;
        }
    }
    const RecordDecoder::StreamResult result =
            RecordDecoder::decodeStream(path == "-" ? std::cin : file, std::cout, stepsOnly);
    return result.trailingBytes == 0 ? 0 : 1;
}

bool parseSteps(const std::vector<std::string>& texts, std::vector<StepSyntax::Step>* steps) {
    std::string error;
    if (texts.empty()) {
        if (StepSyntax::parseLines(std::cin, steps, &error)) return true;
        std::cerr << "vtsp: stdin " << error << "\n";
        return false;
    }
    for (size_t i = 0; i < texts.size(); ++i) {
        StepSyntax::Step step;
        if (!StepSyntax::parse(texts[i], &step, &error)) {
            std::cerr << "vtsp: step " << i + 1 << ": " << error << "\n";
            return false;
        }
        steps->push_back(step);
    }
    return true;
}

int encode(const std::vector<std::string>& args) {
    std::string outPath;
    std::vector<std::string> texts;
    for (size_t i = 0; i < args.size(); ++i) {
        if (args[i] == "-o" && i + 1 < args.size()) {
            outPath = args[++i];
        } else if (args[i] == "-h" || args[i] == "--help") {
            return usage(std::cout, 0);
        } else {
            texts.push_back(args[i]);
        }
    }
    std::vector<StepSyntax::Step> steps;
    if (!parseSteps(texts, &steps)) return kUsageError;
    if (outPath.empty() && isatty(STDOUT_FILENO)) {
        std::cerr << "vtsp: not writing binary records to a terminal; use -o FILE or a pipe\n";
        return kUsageError;
    }
    std::ofstream file;
    if (!outPath.empty()) {
        file.open(outPath, std::ios::binary | std::ios::trunc);
        if (!file) {
            std::cerr << "vtsp: cannot write " << outPath << ": " << strerror(errno) << "\n";
            return kUsageError;
        }
    }
    std::ostream& out = outPath.empty() ? std::cout : file;
    for (const StepSyntax::Step& step : steps) {
        const android::VPR_Comm record = step.record();
        out.write(reinterpret_cast<const char*>(&record), sizeof(record));
    }
    out.flush();
    return out ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) return usage(std::cerr, kUsageError);
    const std::string command = argv[1];
    const std::vector<std::string> args(argv + 2, argv + argc);
    if (command == "decode") return decode(args);
    if (command == "encode") return encode(args);
    if (command == "-h" || command == "--help") return usage(std::cout, 0);
    std::cerr << "vtsp: expected decode or encode but found '" << command << "'\n";
    return usage(std::cerr, kUsageError);
}
