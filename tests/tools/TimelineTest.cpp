// The simulator's output: entries ordered between the platform calls they
// happened between, the aligned text lines, and the mscgen chart.
#include <gtest/gtest.h>

#include <sstream>

#include "MscWriter.h"
#include "HostFakes.h"
#include "Mvd.h"
#include "Timeline.h"
#include "TimelinePrinter.h"

using Kind = TimelineEntry::Kind;

namespace {

TimelineEntry entry(Kind kind, const std::string& actor, const std::string& target, const std::string& text,
                    long ms = -1) {
    TimelineEntry e;
    e.kind = kind;
    e.actor = actor;
    e.target = target;
    e.text = text;
    e.ms = ms;
    return e;
}

}  // namespace

TEST(TimelineOrder, EntriesFallBetweenTheCallsTheyHappenedBetween) {
    Timeline timeline;
    const size_t before = hostfakes::callCount();
    timeline.add(entry(Kind::kStep, "modem", "link", "before"));
    Mvd_ProcStart(1);  // a platform call, recorded by the stand-in
    timeline.add(entry(Kind::kRecordOut, "link", "modem", "after"));
    timeline.addCall(before, "media", "Mvd_ProcStart(1) = 0", "link", "media");
    std::vector<std::string> texts;
    for (const TimelineEntry& e : timeline.takeNew()) texts.push_back(e.text);
    EXPECT_EQ((std::vector<std::string>{"before", "Mvd_ProcStart(1) = 0", "after"}), texts);
    EXPECT_TRUE(timeline.takeNew().empty());
    EXPECT_EQ(3u, timeline.all().size());
}

TEST(TimelineText, ColumnsAlignAndRepliesJoinTheirRequest) {
    EXPECT_EQ("    12 ms  modem   -> link    START stream 1",
              TimelinePrinter::line(entry(Kind::kStep, "modem", "link", "START stream 1", 12)));
    EXPECT_EQ("           media   Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0",
              TimelinePrinter::line(entry(Kind::kCall, "media", "", "Mvd_Open(\"10.0.0.1\", 6000, out=1) = 0")));
    EXPECT_EQ("\n== hold", TimelinePrinter::line(entry(Kind::kHeading, "", "", "hold")));

    std::ostringstream out;
    TimelinePrinter printer(out, false, false);
    printer.print({entry(Kind::kStep, "client", "service", "SET_CAMERAID 1", 5),
                   entry(Kind::kLog, "log", "", "I VideoCallEngineService: VCE_ACTION_SET_CAMERAID"),
                   entry(Kind::kEvent, "client", "", "<- reply 0", 5),
                   entry(Kind::kStep, "client", "service", "RELEASE", 9),
                   entry(Kind::kCall, "camera", "", "camdrvStop(256) = 0"),
                   entry(Kind::kEvent, "client", "", "<- reply 0", 9)});
    EXPECT_EQ("     5 ms  client  -> service SET_CAMERAID 1 = 0\n"
              "     9 ms  client  -> service RELEASE\n"
              "           camera  camdrvStop(256) = 0\n"
              "     9 ms  client  <- reply 0\n",
              out.str());

    std::ostringstream verbose;
    TimelinePrinter(verbose, true, false).print({entry(Kind::kLog, "log", "", "D VTSPManager: recv msg 1")});
    EXPECT_EQ("           log     D VTSPManager: recv msg 1\n", verbose.str());
}

TEST(TimelineChart, ArcsByKindWithSafeLabels) {
    TimelineEntry request = entry(Kind::kStep, "client", "service", "HIDE_LOCAL_IMAGE 1 \"/a\\b\"");
    request.mscFrom = "client";
    request.mscTo = "vce";
    TimelineEntry reply = entry(Kind::kEvent, "client", "", "<- reply 0");
    reply.mscFrom = "vce";
    reply.mscTo = "client";
    TimelineEntry record = entry(Kind::kRecordOut, "link", "modem", "BIND stream 1 10.0.0.1:6000");
    record.mscFrom = "link";
    record.mscTo = "modem";
    TimelineEntry call = entry(Kind::kCall, "media", "", "Mvd_Open(" + std::string(100, 'x') + ")");
    call.mscFrom = "link";
    call.mscTo = "media";
    TimelineEntry death = entry(Kind::kStep, "client", "", "x  process dies");
    death.mscFrom = "client";
    death.mscTo = "vce";
    std::ostringstream out;
    MscWriter::write({entry(Kind::kHeading, "", "", "set-up"), request, reply, record, call, death,
                      entry(Kind::kLog, "log", "", "not drawn")},
                     out);
    const std::string chart = out.str();
    EXPECT_NE(std::string::npos, chart.find("msc {\n"));
    EXPECT_NE(std::string::npos, chart.find("  --- [label=\"set-up\"];\n"));
    EXPECT_NE(std::string::npos, chart.find("  client => vce [label=\"HIDE_LOCAL_IMAGE 1 \\\"/a\\\\b\\\"\"];\n"));
    EXPECT_NE(std::string::npos, chart.find("  vce >> client [label=\"reply 0\"];\n"));
    EXPECT_NE(std::string::npos, chart.find("  link -> modem [label=\"BIND stream 1 10.0.0.1:6000\"];\n"));
    EXPECT_NE(std::string::npos, chart.find("  link => media [label=\"Mvd_Open(" + std::string(60, 'x') + "...\"];\n"));
    EXPECT_NE(std::string::npos, chart.find("  client -x vce [label=\"process dies\"];\n"));
    EXPECT_EQ(std::string::npos, chart.find("not drawn"));
    EXPECT_EQ("}\n", chart.substr(chart.size() - 2));
}
