// The Mme natives through which the application runs the media engine,
// called from Java: start and stop with their rollback, configuration,
// version, log level, statistics and provisioning, and how Java strings
// reach the engine.
#include "JvmHarness.h"
#include "MmeJni.h"

using namespace jvmtest;
using ::testing::Contains;

namespace {

const V kConfigureRuntime = {"Zos_CfgSetLogLevel(255) = 0", "Zos_CfgSetLogDisp(print) = 0",
                             "Mme_CfgSetDumpDebug(1) = 0", "Mme_CfgSetPrintDebug(1) = 0"};
const V kStopEngine = {"Mvd_TaskStop() = 0", "Mme_Stop() = 0", "Zos_SysDestroy() = 0"};

// A fresh call record and log for the next row of a table.
void nextRow(LogCapture& log) {
    hostfakes::reset();
    log.clear();
}

jint workDir(jstring dir) { return mme("cfgSetWorkDir", "(Ljava/lang/String;)I", {L(dir)}); }
std::optional<std::u16string> version() { return mmeString("mmeGetVer", "()Ljava/lang/String;"); }
std::optional<std::u16string> provString(jstring key) {
    return mmeString("provGetValueStr", "(Ljava/lang/String;)Ljava/lang/String;", {L(key)});
}
std::optional<std::u16string> provMapString(jstring key, jint index) {
    return mmeString("provGetMapStr", "(Ljava/lang/String;I)Ljava/lang/String;", {L(key), I(index)});
}

using MmeSystemTest = LoadedCase;

}  // namespace

TEST_F(MmeSystemTest, SysInitStartsTheEngineInOrderOrRollsItAllBackAndSysDestroyStopsIt) {
    const V steps = {"Zos_SysInit", "Mme_Start", "Mvd_TaskStart"};
    const V installBridge = {"Mvd_EvntSetCallback(proc, 1) = 0", "Zpand_ModSetPostDrv(installed) = 0",
                             "Zpand_TimerSetInit(installed) = 0", "Zpand_TimerSetDestroy(installed) = 0",
                             "Zpand_TimerSetStart(installed) = 0", "Zpand_TimerSetStop(installed) = 0"};
    // Row n makes step n fail; the last row starts cleanly.
    for (size_t failing = 0; failing <= steps.size(); ++failing) {
        const bool started = failing == steps.size();
        SCOPED_TRACE(started ? "no step fails" : steps[failing]);
        nextRow(log);
        if (!started) hostfakes::setResult(steps[failing], -1);
        EXPECT_EQ(started ? 0 : 1, mme("sysInit", "()I"));
        V calls = kConfigureRuntime;
        V logged = {"sysInit"};
        for (size_t i = 0; i < steps.size() && i <= failing; ++i) {
            calls.push_back(steps[i] + "() = " + (i == failing ? "-1" : "0"));
            logged.push_back(steps[i]);
        }
        EXPECT_EQ(calls + (started ? installBridge : kStopEngine), hostfakes::callTexts());
        EXPECT_EQ(logged, bridgeLines(log));
        const int bridge = started ? 0 : hostfakes::kNotInstalled;
        EXPECT_EQ(bridge, hostfakes::fireMvdEvent(mvdEvent(6)));
        EXPECT_EQ(bridge, hostfakes::fireZpandTimerStart(5000));
    }
    // The engine's own text goes to the platform log under its tag.
    ASSERT_TRUE(hostfakes::zosPrint("engine says hello"));
    EXPECT_TRUE(log.contains(ANDROID_LOG_INFO, "MME", "engine says hello"));

    const size_t mark = hostfakes::callCount();
    EXPECT_EQ(0, mme("sysDestroy", "()I"));
    EXPECT_EQ(kStopEngine, hostfakes::callTextsSince(mark));
    EXPECT_THAT(bridgeLines(log), Contains("sysDestroy"));
    // The upcalls stay in place for an engine that is started again.
    EXPECT_EQ(0, hostfakes::fireZpandTimerInit());
    EXPECT_THAT(upcalls().back(), onAttachedThread("zpandTimerInit()"));
    EXPECT_EQ(0, mme("sysInit", "()I"));
}

TEST_F(MmeSystemTest, AnUpcallMissingFromTheClassIsOnlyDisabled) {
    // A class without any of the upcall methods: the engine still starts,
    // no error reaches the application, and the upcalls answer 0.
    EXPECT_EQ(0, android::sysInit(env(), Local<jclass>(findClass("android/content/Context"))));
    EXPECT_FALSE(env()->ExceptionCheck());
    EXPECT_EQ(0, hostfakes::fireZpandTimerInit());
    EXPECT_TRUE(upcalls().empty());
}

TEST_F(MmeSystemTest, WorkDirReachesAllThreeDirectoriesAsUtf8AndAppContextTheRuntime) {
    struct Case {
        std::optional<std::u16string> dir;  // nullopt: a null string
        std::string engineText;              // as the call record writes the argument
        std::string logText;
    };
    const std::vector<Case> cases = {
            {u"/data/x", "\"/data/x\"", "/data/x"},
            {u"/data/\u00fc\u20ac\U0001F600", "\"/data/\\xc3\\xbc\\xe2\\x82\\xac\\xf0\\x9f\\x98\\x80\"",
             "/data/\xc3\xbc\xe2\x82\xac\xf0\x9f\x98\x80"},
            // The empty string and a null one are both no text.
            {u"", "NULL", "(null)"},
            {std::nullopt, "NULL", "(null)"},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.logText);
        nextRow(log);
        EXPECT_EQ(0, workDir(c.dir ? newString(*c.dir) : Local<jstring>()));
        const std::string arg = "(" + c.engineText + ") = 0";
        EXPECT_EQ((V{"Mme_CfgSetCfgDir" + arg, "Mme_CfgSetLogDir" + arg, "Zos_CfgSetLogDir" + arg}),
                  hostfakes::callTexts());
        EXPECT_EQ(V{"cfgSetWorkDir, " + c.logText}, bridgeLines(log));
    }
    // The answer is the runtime's, whatever the engine said before it.
    hostfakes::setResult("Mme_CfgSetCfgDir", -1);
    hostfakes::setResult("Zos_CfgSetLogDir", 7);
    EXPECT_EQ(7, workDir(newString(u"/data/x")));

    nextRow(log);
    Local<jobject> context =
            newObject("android/content/Context", "(Ljava/lang/String;)V", {L(newString(u"ims"))});
    EXPECT_EQ(0, mme("cfgSetAppCtx", "(Landroid/content/Context;)I", {L(context)}));
    EXPECT_EQ(V{"Zos_CfgSetAppCtx(ctx) = 0"}, hostfakes::callTexts());
    EXPECT_EQ(V{"cfgSetAppCtx"}, bridgeLines(log));
    hostfakes::setResult("Zos_CfgSetAppCtx", 3);
    EXPECT_EQ(3, mme("cfgSetAppCtx", "(Landroid/content/Context;)I", {L(context)}));
}

TEST_F(MmeSystemTest, VersionJoinsBothTextsAndStaysWithinItsBuffer) {
    nextRow(log);
    EXPECT_EQ(u"melon-1.0|mme-1.0", version());
    EXPECT_EQ(V{"mmeGetVer, melon-1.0|mme-1.0"}, bridgeLines(log));
    EXPECT_EQ((V{"Melon_GetVersion(-> \"melon-1.0\") = 0", "Mme_GetVer(-> \"mme-1.0\") = 0"}),
              hostfakes::callTexts());
    const std::optional<std::string> none;
    const struct {
        std::optional<std::string> melon, mme;
        std::u16string expected;
    } rows[] = {
            {"m\xc3\xa9lon-2\xe2\x82\xac", "mme-\xf0\x9f\x98\x80", u"m\u00e9lon-2\u20ac|mme-\U0001F600"},
            {none, none, u"|"},
            // 511 bytes and the terminator fill the buffer; a character the
            // cut would split is left out whole, one ending at the cut is kept.
            {std::string(600, 'v'), "mme-1.0", std::u16string(511, u'v')},
            {std::string(509, 'a') + "\xe2\x82\xac", "x", std::u16string(509, u'a')},
            {std::string(508, 'a') + "\xe2\x82\xac", "x", std::u16string(508, u'a') + u"\u20ac"},
    };
    for (const auto& row : rows) {
        hostfakes::setVersions(row.melon ? row.melon->c_str() : nullptr,
                               row.mme ? row.mme->c_str() : nullptr);
        EXPECT_EQ(row.expected, version());
    }
}

TEST_F(MmeSystemTest, LogLevelFollowsTheTable) {
    const std::vector<std::pair<jint, V>> rows = {
            {0, {"Mme_CfgSetLogLevel(0) = 0", "Mme_CfgSetLogLevelX(0) = 0"}},
            {1, {"Mme_CfgSetLogLevel(15) = 0", "Mme_CfgSetLogLevelX(6) = 0"}},
            {2, {"Mme_CfgSetLogLevel(255) = 0", "Mme_CfgSetLogLevelX(11) = 0"}},
            {3, {"Mme_CfgSetLogLevel(15) = 0", "Mme_CfgSetLogLevelX(12) = 0"}},
            {4, {}},
            {-1, {}},
    };
    for (const auto& [level, calls] : rows) {
        nextRow(log);
        EXPECT_EQ(0, mme("mmeSetLogLevel", "(I)I", {I(level)})) << level;
        EXPECT_EQ(calls, hostfakes::callTexts()) << level;
        EXPECT_EQ(V{"mmeSetLogLevel, " + std::to_string(level)}, bridgeLines(log));
    }
}

TEST_F(MmeSystemTest, StatisticsReportTheLastSuccessfulQuery) {
    // Zeros before any query or codec event (earlier cases of a shared
    // process may have left values); stream 0 is not queried.
    std::vector<jlong> expected = captureStatistics(0);
    if (firstInProcess()) {
        EXPECT_EQ(std::vector<jlong>(16, 0), expected);
    }
    EXPECT_TRUE(hostfakes::callTexts().empty());
    tagMVD_RTCP_STA stats{};
    for (int i = 0; i < MVD_RTCP_STA_WORDS; ++i) stats.aiWord[i] = 10 + i;
    stats.aiWord[1] = -7;
    hostfakes::setRtcpStats(5, stats);
    expected[4] = -7;  // word 1, sign-extended
    expected[5] = 10;  // word 0
    expected[6] = 15;  // word 5
    expected[7] = 14;  // word 4
    EXPECT_EQ(expected, captureStatistics(5));
    EXPECT_EQ(V{"Mvd_RtcpGetSta(5) = 0"}, hostfakes::callTexts());
    EXPECT_THAT(bridgeLines(log), Contains("captureStatistics"));

    // Only the low 32 bits name the stream; failed queries and stream 0
    // keep what the last good one reported.
    EXPECT_EQ(expected, captureStatistics((jlong{1} << 32) + 5));
    EXPECT_EQ("Mvd_RtcpGetSta(5) = 0", hostfakes::callTexts().back());
    EXPECT_EQ(expected, captureStatistics(6));
    EXPECT_EQ("Mvd_RtcpGetSta(6) = -1", hostfakes::callTexts().back());
    EXPECT_EQ(expected, captureStatistics(0));
    // (The codec words at 14 and 15: MmeVideoEventTest.)

    // Array errors are left pending for the caller; nothing is written.
    Local<jlongArray> shortArray = newLongArray(8, -1);
    const std::pair<jlongArray, const char*> rows[] = {
            {shortArray, "java.lang.ArrayIndexOutOfBoundsException"},
            {nullptr, "java.lang.NullPointerException"}};
    for (const auto& [array, exception] : rows) {
        std::string thrown;
        EXPECT_EQ(0, mme("captureStatistics", "(JJ[J)I", {J(0), J(0), L(array)}, &thrown));
        EXPECT_EQ(exception, thrown);
    }
    EXPECT_EQ(std::vector<jlong>(8, -1), elements(shortArray)) << "nothing is written";
}

TEST_F(MmeSystemTest, ProvisioningPassesKeysAndValuesThrough) {
    hostfakes::setProvValue("video.enabled", 2);
    hostfakes::setProvValue("bitrate", -512);
    hostfakes::setProvString("label", "gr\xc3\xb6\xc3\x9f" "e\xe2\x82\xac\xf0\x9f\x98\x80");
    hostfakes::setProvMapString("codec", 2, "H264");
    const char* kInt = "(Ljava/lang/String;)I";
    const char* kBool = "(Ljava/lang/String;)Z";

    EXPECT_TRUE(callStatic(kMme, "provGetValueBool", kBool, {L(newString(u"video.enabled"))}).z);
    EXPECT_FALSE(callStatic(kMme, "provGetValueBool", kBool, {L(newString(u"other"))}).z);
    EXPECT_EQ(-512, mme("provGetValueInt", kInt, {L(newString(u"bitrate"))}));
    EXPECT_EQ(2, mme("provGetValueEnum", kInt, {L(newString(u"video.enabled"))}));
    EXPECT_EQ((V{"Mme_ProvGetValueBool(\"video.enabled\") = 2", "Mme_ProvGetValueBool(\"other\") = 0",
                 "Mme_ProvGetValueInt(\"bitrate\") = -512", "Mme_ProvGetValueEnum(\"video.enabled\") = 2"}),
              hostfakes::callTexts());

    EXPECT_EQ(u"gr\u00f6\u00dfe\u20ac\U0001F600", provString(newString(u"label")));
    EXPECT_EQ(u"H264", provMapString(newString(u"codec"), 2));
    EXPECT_THAT(hostfakes::callTexts(), Contains("Mme_ProvGetMapStr(\"codec\", 2, -> \"H264\") = 0"));
    // No text from the engine is the empty string, never null.
    EXPECT_EQ(u"", provString(newString(u"unknown")));
    EXPECT_EQ(u"", provMapString(newString(u"codec"), 1));

    // A null key reaches the engine as no text.
    hostfakes::reset();
    EXPECT_EQ(0, mme("provGetValueInt", kInt, {L(nullptr)}));
    EXPECT_EQ(u"", provString(nullptr));
    EXPECT_EQ(u"", provMapString(nullptr, 0));
    EXPECT_EQ((V{"Mme_ProvGetValueInt(NULL) = 0", "Mme_ProvGetValueStr(NULL, -> NULL) = 0",
                 "Mme_ProvGetMapStr(NULL, 0, -> NULL) = 0"}),
              hostfakes::callTexts());
}
