// The simulator's output: the aligned text lines and the mscgen chart (where
// entries fall between the platform calls is SimulatorPlay's part).
#include <gtest/gtest.h>

#include <sstream>

#include "MscWriter.h"
#include "Timeline.h"
#include "TimelinePrinter.h"

using Kind = TimelineEntry::Kind;

namespace {

TimelineEntry entry(Kind kind, const std::string& actor, const std::string& target, const std::string& text,
                    long ms = -1, const std::string& mscFrom = "", const std::string& mscTo = "") {
    TimelineEntry e;
    e.kind = kind;
    e.actor = actor;
    e.target = target;
    e.text = text;
    e.ms = ms;
    e.mscFrom = mscFrom;
    e.mscTo = mscTo;
    return e;
}

}  // namespace

TEST(TimelineText, ColumnsAlignAndRepliesJoinTheirRequest) {
    EXPECT_EQ("    12 ms  modem   -> link    START stream 1",
              TimelinePrinter::line(entry(Kind::kStep, "modem", "link", "START stream 1", 12)));
    EXPECT_EQ("           media   Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0",
              TimelinePrinter::line(entry(Kind::kCall, "media", "", "Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0")));
    EXPECT_EQ("\n== hold", TimelinePrinter::line(entry(Kind::kHeading, "", "", "hold")));

    // Log lines only when verbose; a reply right after its request joins it.
    std::ostringstream out, verbose;
    const std::vector<TimelineEntry> entries = {
            entry(Kind::kStep, "client", "service", "SET_CAMERAID 1", 5),
            entry(Kind::kLog, "log", "", "I VideoCallEngineService: VCE_ACTION_SET_CAMERAID"),
            entry(Kind::kEvent, "client", "", "<- reply 0", 5), entry(Kind::kStep, "client", "service", "RELEASE", 9),
            entry(Kind::kCall, "camera", "", "camdrvStop(256) = 0"), entry(Kind::kEvent, "client", "", "<- reply 0", 9)};
    TimelinePrinter(out, false, false).print(entries);
    EXPECT_EQ("     5 ms  client  -> service SET_CAMERAID 1 = 0\n"
              "     9 ms  client  -> service RELEASE\n"
              "           camera  camdrvStop(256) = 0\n"
              "     9 ms  client  <- reply 0\n",
              out.str());
    TimelinePrinter(verbose, true, false).print({entries[1]});
    EXPECT_EQ("           log     I VideoCallEngineService: VCE_ACTION_SET_CAMERAID\n", verbose.str());
}

TEST(TimelineChart, ArcsByKindWithSafeLabels) {
    std::ostringstream out;
    MscWriter::write({entry(Kind::kHeading, "", "", "set-up"),
                      entry(Kind::kStep, "client", "service", "HIDE_LOCAL_IMAGE 1 \"/a\\b\"", -1, "client", "vce"),
                      entry(Kind::kEvent, "client", "", "<- reply 0", -1, "vce", "client"),
                      entry(Kind::kRecordOut, "link", "modem", "BIND stream 1 10.0.0.1:6000", -1, "link", "modem"),
                      entry(Kind::kCall, "media", "", "Mvd_Open(" + std::string(100, 'x') + ")", -1, "link", "media"),
                      entry(Kind::kStep, "client", "", "x  process dies", -1, "client", "vce"),
                      entry(Kind::kLog, "log", "", "not drawn")},
                     out);
    const std::string chart = out.str();
    // After the header (checked by the vce-sim CTest entry), the arcs in order, long labels cut; the log line is not drawn.
    const std::string cut = "Mvd_Open(" + std::string(60, 'x') + "...";
    EXPECT_EQ("  --- [label=\"set-up\"];\n"
              "  client => vce [label=\"HIDE_LOCAL_IMAGE 1 \\\"/a\\\\b\\\"\"];\n"
              "  vce >> client [label=\"reply 0\"];\n"
              "  link -> modem [label=\"BIND stream 1 10.0.0.1:6000\"];\n"
              "  link => media [label=\"" + cut + "\"];\n"
              "  client -x vce [label=\"process dies\"];\n"
              "}\n",
              chart.substr(chart.find("  --- ")));
}
