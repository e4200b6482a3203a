// The Mme natives through which the application runs the media engine,
// called from Java: start and stop with their rollback, configuration,
// version, log level, statistics and provisioning, and how Java strings
// reach the engine.
#include <android/log.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <vector>

#include "HostFakes.h"
#include "JvmHarness.h"

using namespace jvmtest;
using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::StartsWith;
using V = std::vector<std::string>;

namespace {

const V kConfigureRuntime = {"Zos_CfgSetLogLevel(255) = 0", "Zos_CfgSetLogDisp(print) = 0",
                             "Mme_CfgSetDumpDebug(1) = 0", "Mme_CfgSetPrintDebug(1) = 0"};
const V kStopEngine = {"Mvd_TaskStop() = 0", "Mme_Stop() = 0", "Zos_SysDestroy() = 0"};

V operator+(V a, const V& b) {
    a.insert(a.end(), b.begin(), b.end());
    return a;
}

class MmeSystemTest : public JvmCase {
protected:
    void SetUp() override {
        JvmCase::SetUp();
        load();
    }

    static jint workDir(jstring dir) { return mme("cfgSetWorkDir", "(Ljava/lang/String;)I", {L(dir)}); }
    static std::optional<std::u16string> version() {
        return callString(kMme, "mmeGetVer", "()Ljava/lang/String;");
    }
    static std::vector<jlong> statistics(jlong stream) {
        Local<jlongArray> out = newLongArray(16, -1);
        EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(7), J(stream), L(out)}));
        return elements(out);
    }
    static std::optional<std::u16string> provString(jstring key) {
        return callString(kMme, "provGetValueStr", "(Ljava/lang/String;)Ljava/lang/String;", {L(key)});
    }
    static std::optional<std::u16string> provMapString(jstring key, jint index) {
        return callString(kMme, "provGetMapStr", "(Ljava/lang/String;I)Ljava/lang/String;",
                          {L(key), I(index)});
    }
};

}  // namespace

TEST_F(MmeSystemTest, SysInitStartsTheEngineInOrderAndInstallsTheBridge) {
    EXPECT_EQ(0, mme("sysInit", "()I"));
    const V started = {"Zos_SysInit() = 0", "Mme_Start() = 0", "Mvd_TaskStart() = 0",
                       "Mvd_EvntSetCallback(proc, 1) = 0", "Zpand_ModSetPostDrv(installed) = 0",
                       "Zpand_TimerSetInit(installed) = 0", "Zpand_TimerSetDestroy(installed) = 0",
                       "Zpand_TimerSetStart(installed) = 0", "Zpand_TimerSetStop(installed) = 0"};
    EXPECT_EQ(kConfigureRuntime + started, hostfakes::callTexts());
    EXPECT_EQ((V{"sysInit", "Zos_SysInit", "Mme_Start", "Mvd_TaskStart"}), bridgeLines(log));

    // The engine's own text goes to the platform log under its tag.
    ASSERT_TRUE(hostfakes::zosPrint("engine says hello"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "MME", "engine says hello"));
}

TEST_F(MmeSystemTest, AFailedStartStepRollsEverythingBack) {
    const V steps = {"Zos_SysInit", "Mme_Start", "Mvd_TaskStart"};
    for (size_t failing = 0; failing < steps.size(); ++failing) {
        SCOPED_TRACE(steps[failing]);
        hostfakes::reset();
        log.clear();
        hostfakes::setResult(steps[failing], -1);
        EXPECT_EQ(1, mme("sysInit", "()I"));
        V started;
        V logged = {"sysInit"};
        for (size_t i = 0; i <= failing; ++i) {
            started.push_back(steps[i] + "() = " + (i == failing ? "-1" : "0"));
            logged.push_back(steps[i]);
        }
        EXPECT_EQ(kConfigureRuntime + started + kStopEngine, hostfakes::callTexts());
        EXPECT_EQ(logged, bridgeLines(log));
        EXPECT_EQ(hostfakes::kNotInstalled, hostfakes::fireMvdEvent(mvdEvent(6)));
        EXPECT_EQ(hostfakes::kNotInstalled, hostfakes::fireZpandTimerStart(5000));
    }
}

TEST_F(MmeSystemTest, SysDestroyStopsTheEngineAndKeepsTheBridge) {
    ASSERT_EQ(0, mme("sysInit", "()I"));
    const size_t mark = hostfakes::callCount();
    EXPECT_EQ(0, mme("sysDestroy", "()I"));
    EXPECT_EQ(kStopEngine, hostfakes::callTextsSince(mark));
    EXPECT_THAT(bridgeLines(log), Contains("sysDestroy"));

    // The upcalls stay in place for an engine that is started again.
    EXPECT_EQ(0, hostfakes::fireZpandTimerInit());
    EXPECT_THAT(upcalls(), ElementsAre(StartsWith("zpandTimerInit() on Thread-")));
    EXPECT_EQ(0, mme("sysInit", "()I"));
}

TEST_F(MmeSystemTest, WorkDirReachesAllThreeDirectoriesAsUtf8) {
    struct Case {
        std::u16string dir;
        std::string engineText;  // as the call record writes the argument
        std::string logText;
    };
    const std::vector<Case> cases = {
            {u"/data/x", "\"/data/x\"", "/data/x"},
            {u"abc", "\"abc\"", "abc"},
            {u"/data/\u00fc\u20ac\U0001F600", "\"/data/\\xc3\\xbc\\xe2\\x82\\xac\\xf0\\x9f\\x98\\x80\"",
             "/data/\xc3\xbc\xe2\x82\xac\xf0\x9f\x98\x80"},
            {u"", "NULL", "(null)"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.logText);
        hostfakes::reset();
        log.clear();
        EXPECT_EQ(0, workDir(newString(c.dir)));
        const std::string arg = "(" + c.engineText + ") = 0";
        EXPECT_EQ((V{"Mme_CfgSetCfgDir" + arg, "Mme_CfgSetLogDir" + arg, "Zos_CfgSetLogDir" + arg}),
                  hostfakes::callTexts());
        EXPECT_EQ(V{"cfgSetWorkDir, " + c.logText}, bridgeLines(log));
    }

    // A null string is no text, as the empty one.
    hostfakes::reset();
    EXPECT_EQ(0, workDir(nullptr));
    EXPECT_EQ((V{"Mme_CfgSetCfgDir(NULL) = 0", "Mme_CfgSetLogDir(NULL) = 0", "Zos_CfgSetLogDir(NULL) = 0"}),
              hostfakes::callTexts());

    // The answer is the runtime's, whatever the engine said before it.
    hostfakes::setResult("Mme_CfgSetCfgDir", -1);
    hostfakes::setResult("Zos_CfgSetLogDir", 7);
    EXPECT_EQ(7, workDir(newString(u"/data/x")));
}

TEST_F(MmeSystemTest, AppContextIsHandedToTheRuntime) {
    Local<jobject> context = newContext("ims");
    EXPECT_EQ(0, mme("cfgSetAppCtx", "(Landroid/content/Context;)I", {L(context)}));
    EXPECT_EQ(V{"Zos_CfgSetAppCtx(ctx) = 0"}, hostfakes::callTexts());
    EXPECT_EQ(V{"cfgSetAppCtx"}, bridgeLines(log));
    hostfakes::setResult("Zos_CfgSetAppCtx", 3);
    EXPECT_EQ(3, mme("cfgSetAppCtx", "(Landroid/content/Context;)I", {L(context)}));
}

TEST_F(MmeSystemTest, VersionJoinsBothTextsAndStaysWithinItsBuffer) {
    EXPECT_EQ(u"melon-1.0|mme-1.0", version());
    EXPECT_EQ(V{"mmeGetVer, melon-1.0|mme-1.0"}, bridgeLines(log));

    hostfakes::setVersions("m\xc3\xa9lon-2\xe2\x82\xac", "mme-\xf0\x9f\x98\x80");
    EXPECT_EQ(u"m\u00e9lon-2\u20ac|mme-\U0001F600", version());
    hostfakes::setVersions(nullptr, nullptr);
    EXPECT_EQ(u"|", version());

    // 511 bytes and the terminator fill the buffer.
    hostfakes::setVersions(std::string(600, 'v').c_str(), "mme-1.0");
    EXPECT_EQ(std::u16string(511, u'v'), version());
    // A character the cut would split is left out whole...
    hostfakes::setVersions((std::string(509, 'a') + "\xe2\x82\xac").c_str(), "x");
    EXPECT_EQ(std::u16string(509, u'a'), version());
    // ...and one that ends exactly at the cut is kept.
    hostfakes::setVersions((std::string(508, 'a') + "\xe2\x82\xac").c_str(), "x");
    EXPECT_EQ(std::u16string(508, u'a') + u"\u20ac", version());
}

TEST_F(MmeSystemTest, LogLevelFollowsTheTable) {
    struct Row {
        jint level;
        V calls;
    };
    const std::vector<Row> rows = {
            {0, {"Mme_CfgSetLogLevel(0) = 0", "Mme_CfgSetLogLevelX(0) = 0"}},
            {1, {"Mme_CfgSetLogLevel(15) = 0", "Mme_CfgSetLogLevelX(6) = 0"}},
            {2, {"Mme_CfgSetLogLevel(255) = 0", "Mme_CfgSetLogLevelX(11) = 0"}},
            {3, {"Mme_CfgSetLogLevel(15) = 0", "Mme_CfgSetLogLevelX(12) = 0"}},
            {4, {}},
            {-1, {}},
    };
    for (const Row& row : rows) {
        hostfakes::reset();
        log.clear();
        EXPECT_EQ(0, mme("mmeSetLogLevel", "(I)I", {I(row.level)})) << row.level;
        EXPECT_EQ(row.calls, hostfakes::callTexts()) << row.level;
        EXPECT_EQ(V{"mmeSetLogLevel, " + std::to_string(row.level)}, bridgeLines(log));
    }
}

TEST_F(MmeSystemTest, StatisticsReportTheLastSuccessfulQuery) {
    // Zeros before any query or codec event (earlier cases of a shared
    // process may have left values behind).
    std::vector<jlong> expected = statistics(0);
    if (firstInProcess()) {
        EXPECT_EQ(std::vector<jlong>(16, 0), expected);
    }
    EXPECT_TRUE(hostfakes::callTexts().empty()) << "stream 0 is not queried";
    tagMVD_RTCP_STA stats{};
    for (int i = 0; i < MVD_RTCP_STA_WORDS; ++i) stats.aiWord[i] = 10 + i;
    stats.aiWord[1] = -7;
    hostfakes::setRtcpStats(5, stats);
    expected[4] = -7;  // word 1, sign-extended
    expected[5] = 10;  // word 0
    expected[6] = 15;  // word 5
    expected[7] = 14;  // word 4
    EXPECT_EQ(expected, statistics(5));
    EXPECT_EQ(V{"Mvd_RtcpGetSta(5) = 0"}, hostfakes::callTexts());
    EXPECT_THAT(bridgeLines(log), Contains("captureStatistics"));

    // Only the low 32 bits name the stream; failed queries and stream 0
    // keep what the last good one reported.
    EXPECT_EQ(expected, statistics((jlong{1} << 32) + 5));
    EXPECT_EQ("Mvd_RtcpGetSta(5) = 0", hostfakes::callTexts().back());
    EXPECT_EQ(expected, statistics(6));
    EXPECT_EQ("Mvd_RtcpGetSta(6) = -1", hostfakes::callTexts().back());
    hostfakes::setResult("Mvd_RtcpGetSta", -2);
    EXPECT_EQ(expected, statistics(5));
    EXPECT_EQ(expected, statistics(0));

    // A codec change lands in the last two.
    ASSERT_EQ(0, mme("sysInit", "()I"));
    tagMVD_EVNT codec = mvdEvent(7);
    codec.aiWord[7] = 5;
    codec.aiWord[8] = 2;
    hostfakes::fireMvdEvent(codec);
    expected[14] = 5;
    expected[15] = 2;
    EXPECT_EQ(expected, statistics(0));
}

TEST_F(MmeSystemTest, StatisticsArrayErrorsAreLeftPendingForTheCaller) {
    Local<jlongArray> shortArray = newLongArray(8, -1);
    std::string thrown;
    EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(0), J(0), L(shortArray)}, &thrown));
    EXPECT_EQ("java.lang.ArrayIndexOutOfBoundsException", thrown);
    EXPECT_EQ(std::vector<jlong>(8, -1), elements(shortArray)) << "nothing is written";

    EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(0), J(0), L(nullptr)}, &thrown));
    EXPECT_EQ("java.lang.NullPointerException", thrown);
}

TEST_F(MmeSystemTest, ProvisioningPassesKeysAndValuesThrough) {
    hostfakes::setProvValue("video.enabled", 2);
    hostfakes::setProvValue("bitrate", -512);
    hostfakes::setProvString("name", "ims");
    hostfakes::setProvString("none", nullptr);
    hostfakes::setProvString("label", "gr\xc3\xb6\xc3\x9f" "e\xe2\x82\xac\xf0\x9f\x98\x80");
    hostfakes::setProvMapString("codec", 2, "H264");
    const char* kInt = "(Ljava/lang/String;)I";
    const char* kBool = "(Ljava/lang/String;)Z";

    EXPECT_TRUE(callBool(kMme, "provGetValueBool", kBool, {L(newString(u"video.enabled"))}));
    EXPECT_FALSE(callBool(kMme, "provGetValueBool", kBool, {L(newString(u"other"))}));
    EXPECT_EQ(-512, mme("provGetValueInt", kInt, {L(newString(u"bitrate"))}));
    EXPECT_EQ(2, mme("provGetValueEnum", kInt, {L(newString(u"video.enabled"))}));
    EXPECT_EQ((V{"Mme_ProvGetValueBool(\"video.enabled\") = 2", "Mme_ProvGetValueBool(\"other\") = 0",
                 "Mme_ProvGetValueInt(\"bitrate\") = -512", "Mme_ProvGetValueEnum(\"video.enabled\") = 2"}),
              hostfakes::callTexts());

    EXPECT_EQ(u"ims", provString(newString(u"name")));
    EXPECT_EQ(u"gr\u00f6\u00dfe\u20ac\U0001F600", provString(newString(u"label")));
    // No text from the engine is the empty string, never null.
    EXPECT_EQ(u"", provString(newString(u"none")));
    EXPECT_EQ(u"", provString(newString(u"unknown")));
    EXPECT_EQ(u"H264", provMapString(newString(u"codec"), 2));
    EXPECT_EQ(u"", provMapString(newString(u"codec"), 1));
    EXPECT_THAT(hostfakes::callTexts(), Contains("Mme_ProvGetMapStr(\"codec\", 2, -> \"H264\") = 0"));

    // A null key reaches the engine as no text.
    hostfakes::reset();
    EXPECT_EQ(0, mme("provGetValueInt", kInt, {L(nullptr)}));
    EXPECT_EQ(u"", provString(nullptr));
    EXPECT_EQ(u"", provMapString(nullptr, 0));
    EXPECT_EQ((V{"Mme_ProvGetValueInt(NULL) = 0", "Mme_ProvGetValueStr(NULL, -> NULL) = 0",
                 "Mme_ProvGetMapStr(NULL, 0, -> NULL) = 0"}),
              hostfakes::callTexts());
}
