#include "MscWriter.h"

namespace {

using Kind = TimelineEntry::Kind;

// mscgen's arcs: => a call, >> its return, -> a message, -x a lost one.
const char* arcOf(const TimelineEntry& e) {
    if (e.text.compare(0, 2, "x ") == 0) return "-x";
    if (e.text.compare(0, 8, "<- reply") == 0 || e.text.compare(0, 11, "<- no reply") == 0) return ">>";
    if (e.kind == Kind::kCall || e.mscFrom == "client" || e.mscTo == "client") return "=>";
    return "->";
}

// Long labels (JSON texts, trace lines) would spill over the chart.
constexpr size_t kLabelLimit = 72;

std::string labelOf(const TimelineEntry& e) {
    std::string text = e.text;
    if (text.compare(0, 3, "<- ") == 0 || text.compare(0, 3, "x  ") == 0) text = text.substr(3);
    if (text.size() > kLabelLimit) text = text.substr(0, kLabelLimit - 3) + "...";
    return MscWriter::escaped(text);
}

}  // namespace

std::string MscWriter::escaped(const std::string& text) {
    std::string out;
    for (char c : text) {
        if (c == '"' || c == '\\') out += '\\';
        out += static_cast<unsigned char>(c) < 0x20 ? ' ' : c;
    }
    return out;
}

void MscWriter::write(const std::vector<TimelineEntry>& entries, std::ostream& out) {
    out << "# A call played by vce-sim. Draw it with: mscgen -T png -o call.png THIS-FILE\n"
           "msc {\n"
           "  hscale = \"2.2\", arcgradient = \"4\", wordwraparcs = \"true\";\n"
           "  client [label=\"IMS client\"], vce [label=\"service / engine\"], media [label=\"media libraries\"],\n"
           "  link [label=\"modem link\"], modem [label=\"modem\"];\n";
    for (const TimelineEntry& e : entries) {
        if (e.kind == Kind::kHeading) {
            out << "  --- [label=\"" << escaped(e.text) << "\"];\n";
        } else if (e.kind == Kind::kExpectFailed) {
            out << "  --- [label=\"expect FAILED " << escaped(e.text.substr(8)) << "\", textcolour=\"red\"];\n";
        } else if (!e.mscFrom.empty() && !e.mscTo.empty()) {
            out << "  " << e.mscFrom << " " << arcOf(e) << " " << e.mscTo << " [label=\"" << labelOf(e) << "\"];\n";
        }
    }
    out << "}\n";
}
