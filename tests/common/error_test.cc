// The per-thread error stack, its reports and the reporting macros.
#include <errno.h>
#include <pthread.h>
#include <stdio.h>
#include <string.h>
#include <syslog.h>
#include <unistd.h>

#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "common/tessel_report.h"
#include "support/sandbox.h"
#include "tessel_error.h"

static constexpr const char kTesselModule[] = "tests/common/error_test";

namespace {

// Runs fn on a new thread, whose error stack starts empty.
template <typename Fn>
void OnFreshThread(Fn fn) {
    std::thread t(fn);
    t.join();
}

std::string ReadStream(FILE *f) {
    fflush(f);
    rewind(f);
    std::string text;
    char buf[4096];
    size_t n;
    while (0 < (n = fread(buf, 1, sizeof(buf), f))) {
        text.append(buf, n);
    }
    return text;
}

// What TesselErrPrint writes for this thread's stack.
std::string PrintedReport() {
    FILE *f = tmpfile();
    EXPECT_NE(nullptr, f);
    if (nullptr == f) {
        return std::string();
    }
    TesselErrPrint(f);
    std::string text = ReadStream(f);
    fclose(f);
    return text;
}

// A failure that started in one place and travelled up through two more.
void MakeThreeFrameError() {
    TesselErrSetEx(1008, "object/object_get", 120, "NULL == pObj");
    TesselErrAppendEx("object/object_list", 45, "!Get(jParm)");
    TesselErrAppendEx(NULL, 7, NULL);
}

const char kThreeFramePrint[] =
    "tessel call stack:\n"
    "   (:7)\n"
    "  !Get(jParm) (object/object_list:45)\n"
    "  NULL == pObj (object/object_get:120)\n"
    "  ErrNo=[1008] (Object not exists.)\n";

// The report lines of common/tessel_error logged since mark, without the
// "common/tessel_error:<line> " prefix, and whether all were at LOG_ERR.
std::vector<std::string> ErrorModuleLines(size_t mark, bool *pAllErr) {
    static const std::string prefix = "common/tessel_error:";
    std::vector<std::string> lines;
    *pAllErr = true;
    for (const tessel_test::SyslogLine &line : tessel_test::SyslogSince(mark)) {
        const std::string &msg = line.message;
        if (0 != msg.compare(0, prefix.size(), prefix)) {
            continue;
        }
        size_t digits = msg.find_first_not_of("0123456789", prefix.size());
        if (std::string::npos == digits || prefix.size() == digits || ' ' != msg[digits]) {
            continue;
        }
        lines.push_back(msg.substr(digits + 1));
        *pAllErr = *pAllErr && (LOG_ERR == (line.priority & 7));
    }
    return lines;
}

// Logs a unique line and waits for it, so that everything logged before it
// has reached the captured log.
void SyncSyslog(size_t mark, const std::string &tag) {
    std::string sentinel = "sync " + tag + " " + std::to_string(getpid());
    syslog(LOG_INFO, "%s", sentinel.c_str());
    ASSERT_TRUE(tessel_test::WaitForSyslog(sentinel, mark).has_value());
}

TEST(ErrorStack, IsPerThread) {
    TesselErrSetEx(1026, "common/tessel_conf", 10, "main thread");
    constexpr int kThreads = 4;
    pthread_barrier_t barrier;
    ASSERT_EQ(0, pthread_barrier_init(&barrier, NULL, kThreads));
    std::vector<std::thread> threads;
    std::vector<int> startCodes(kThreads, -99);
    std::vector<std::string> seen(kThreads);
    for (int i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            startCodes[i] = TesselErrCodeGet();
            std::string own = "thread " + std::to_string(i);
            TesselErrSetEx(1000 + i, "worker", i, "%s", own.c_str());
            TesselErrAppendEx("caller", 100 + i, "up from %d", i);
            // Every thread has set its error before any reads its own back.
            pthread_barrier_wait(&barrier);
            const Json::Value &jStack = TesselErrMsgGet();
            seen[i] = std::to_string(TesselErrCodeGet()) + "|" + jStack[0u]["msg"].asString() + "|" +
                      jStack[1u]["msg"].asString() + "|" + std::to_string(jStack.size());
        });
    }
    for (std::thread &t : threads) {
        t.join();
    }
    pthread_barrier_destroy(&barrier);
    for (int i = 0; i < kThreads; ++i) {
        EXPECT_EQ(0, startCodes[i]) << "thread " << i << " started with an error";
        EXPECT_EQ(std::to_string(1000 + i) + "|thread " + std::to_string(i) + "|up from " + std::to_string(i) + "|2",
                  seen[i]);
    }
    ASSERT_EQ(1u, TesselErrMsgGet().size());
    EXPECT_EQ(1026, TesselErrCodeGet());
    EXPECT_EQ("main thread", TesselErrMsgGet()[0u]["msg"].asString());
}

TEST(ErrorStack, FramesRootCauseFirstAndOnlySetClears) {
    TesselErrSetEx(1, "stale", 1, "stale");
    MakeThreeFrameError();
    const Json::Value &jStack = TesselErrMsgGet();
    ASSERT_EQ(3u, jStack.size());
    Json::Value jRoot(Json::objectValue);
    jRoot["code"] = 1008;
    jRoot["file"] = "object/object_get";
    jRoot["line"] = 120;
    jRoot["msg"] = "NULL == pObj";
    EXPECT_EQ(jRoot, jStack[0u]);
    Json::Value jUp(Json::objectValue);
    jUp["file"] = "object/object_list";
    jUp["line"] = 45;
    jUp["msg"] = "!Get(jParm)";
    EXPECT_EQ(jUp, jStack[1u]);
    Json::Value jBare(Json::objectValue);
    jBare["file"] = "";
    jBare["line"] = 7;
    jBare["msg"] = "";
    EXPECT_EQ(jBare, jStack[2u]);

    TesselErrSetEx(1003, NULL, 0, NULL);
    ASSERT_EQ(1u, TesselErrMsgGet().size());
    EXPECT_EQ(1003, TesselErrCodeGet());
    EXPECT_EQ("", TesselErrMsgGet()[0u]["file"].asString());
    EXPECT_EQ("", TesselErrMsgGet()[0u]["msg"].asString());
}

TEST(ErrorStack, CodeOfTheRootCauseOnly) {
    OnFreshThread([] {
        EXPECT_EQ(0, TesselErrCodeGet());
        TesselErrAppendEx("a", 1, "first");
        EXPECT_EQ(-1, TesselErrCodeGet()) << "frame 0 without a code";
        TesselErrSetEx(1012, "b", 2, "x");
        TesselErrAppendEx("c", 3, "y");
        EXPECT_EQ(1012, TesselErrCodeGet());
        TesselErrSetEx(999, "d", 4, "unknown code");
        EXPECT_EQ(999, TesselErrCodeGet());
    });
}

TEST(ErrorStack, MessageFormatting) {
    // Around the first buffer's size and well beyond it.
    for (size_t length : {1022u, 1023u, 1024u, 1025u, 5000u}) {
        std::string text(length, 'x');
        text.back() = 'y';
        TesselErrSetEx(1000, "f", 1, "%s", text.c_str());
        EXPECT_EQ(text, TesselErrMsgGet()[0u]["msg"].asString()) << "length " << length;
        TesselErrAppendEx("f", 2, "<%s>", text.c_str());
        EXPECT_EQ("<" + text + ">", TesselErrMsgGet()[1u]["msg"].asString()) << "length " << length;
    }
    TesselErrSetEx(1000, "f", 1, "%d of %s, %u%%", -3, "seven", 7u);
    EXPECT_EQ("-3 of seven, 7%", TesselErrMsgGet()[0u]["msg"].asString());
}

TEST(ErrorStack, GetStringGivesTheInterfaceKeyNotTheMessage) {
    const char *kUntouched = "untouched";
    struct Case {
        int code;
        const char *key;      // expected result (nullptr: a null pointer)
        const char *section;  // expected section afterwards
    } cases[] = {
        {1000, "error_system", "common"},
        {1008, nullptr, ""},
        {1005, nullptr, ""},
        {1030, nullptr, ""},
        {999, "", kUntouched},   // unknown: section place left alone
        {1031, nullptr, ""},
        {1032, "", kUntouched},  // a code without a table entry
        {902, "", kUntouched},
        {0, "", kUntouched},
    };
    for (const Case &c : cases) {
        const char *szSection = kUntouched;
        const char *szKey = TesselErrGetString(c.code, &szSection);
        if (nullptr == c.key) {
            EXPECT_EQ(nullptr, szKey) << c.code;
        } else {
            ASSERT_NE(nullptr, szKey) << c.code;
            EXPECT_STREQ(c.key, szKey) << c.code;
        }
        EXPECT_STREQ(c.section, szSection) << c.code;
    }
    EXPECT_STREQ("error_system", TesselErrGetString(1000));
}

TEST(ErrorStack, CodeTableOrder) {
    std::vector<int> want = {1000, 1001, 1002, 1003, 1005, 1004};
    for (int code = 1006; code <= 1031; ++code) {
        want.push_back(code);
    }
    ASSERT_EQ(want.size(), static_cast<size_t>(TESSEL_ERROR_STRING_COUNT));
    for (size_t i = 0; i < want.size(); ++i) {
        EXPECT_EQ(want[i], rgErrorString[i].code) << "entry " << i;
        ASSERT_NE(nullptr, rgErrorString[i].message);
        EXPECT_EQ(0 == i, nullptr != rgErrorString[i].section) << "entry " << i;
        EXPECT_EQ(0 == i, nullptr != rgErrorString[i].key) << "entry " << i;
    }
}

TEST(ErrorReport, PrintLayout) {
    MakeThreeFrameError();
    EXPECT_EQ(kThreeFramePrint, PrintedReport());

    struct Case {
        int code;
        const char *errnoLine;  // "" when the code has no message
    } cases[] = {
        {1000, "  ErrNo=[1000] (Operation failed.)\n"},
        {1004, "  ErrNo=[1004] (Create DB data failed.)\n"},
        {1005, "  ErrNo=[1005] (Write DB data failed.)\n"},
        {1024, "  ErrNo=[1024] (PostgresSQL service is disabled.)\n"},
        {1027, "  ErrNo=[1027] (tessel is disabled.)\n"},
        {1030, "  ErrNo=[1030] (Object owner is disabled or expired.)\n"},
        {1031, "  ErrNo=[1031] (Object ID already exists.)\n"},
        {1032, ""},
        {900, ""},
        {999, ""},
    };
    for (const Case &c : cases) {
        TesselErrSetEx(c.code, "common/tessel_conf", 33, "!jConf.isObject()");
        EXPECT_EQ(std::string("tessel call stack:\n  !jConf.isObject() (common/tessel_conf:33)\n") + c.errnoLine,
                  PrintedReport());
    }
}

TEST(ErrorReport, PrintWithoutCodeOrWithMissingMembers) {
    OnFreshThread([] {
        TesselErrAppendEx("lock/tessel_lock", 12, "!ReadLock()");
        EXPECT_EQ("tessel call stack:\n  !ReadLock() (lock/tessel_lock:12)\n", PrintedReport());

        // An application may edit its stack; missing members print as placeholders.
        TesselErrSetEx(1001, "x", 5, "y");
        Json::Value &jFrame = TesselErrMsgGet()[0u];
        jFrame.removeMember("msg");
        jFrame.removeMember("file");
        jFrame.removeMember("line");
        EXPECT_EQ("tessel call stack:\n  ---- (----:0)\n  ErrNo=[1001] (Lock failed.)\n", PrintedReport());
    });
}

TEST(ErrorReport, EmptyStackPrintsNothing) {
    OnFreshThread([] {
        EXPECT_EQ("", PrintedReport());
        size_t mark = tessel_test::SyslogMark();
        TesselErrSyslog();
        SyncSyslog(mark, "empty");
        bool allErr = true;
        EXPECT_TRUE(ErrorModuleLines(mark, &allErr).empty());
    });
}

TEST(ErrorReport, NullStreamMeansStandardError) {
    MakeThreeFrameError();
    FILE *capture = tmpfile();
    ASSERT_NE(nullptr, capture);
    fflush(stderr);
    int saved = dup(STDERR_FILENO);
    ASSERT_LE(0, saved);
    ASSERT_LE(0, dup2(fileno(capture), STDERR_FILENO));
    TesselErrPrint(NULL);
    fflush(stderr);
    dup2(saved, STDERR_FILENO);
    close(saved);
    EXPECT_EQ(kThreeFramePrint, ReadStream(capture));
    fclose(capture);
}

TEST(ErrorReport, SyslogLayout) {
    MakeThreeFrameError();
    size_t mark = tessel_test::SyslogMark();
    TesselErrSyslog();
    ASSERT_TRUE(tessel_test::WaitForSyslog("ErrNo=[1008] (Object not exists.)", mark).has_value());
    bool allErr = false;
    std::vector<std::string> lines = ErrorModuleLines(mark, &allErr);
    std::vector<std::string> want = {
        "tessel call stack:",
        "   (:7)",
        "  !Get(jParm) (object/object_list:45)",
        "  NULL == pObj (object/object_get:120)",
        "  ErrNo=[1008] (Object not exists.)",
    };
    EXPECT_EQ(want, lines);
    EXPECT_TRUE(allErr) << "report lines must be logged at LOG_ERR";

    // Without a code in frame 0, no ErrNo line.
    OnFreshThread([] {
        TesselErrAppendEx("dlopen/loader", 9, "NULL == pHookTable");
        size_t mark2 = tessel_test::SyslogMark();
        TesselErrSyslog();
        SyncSyslog(mark2, "nocode");
        bool allErr2 = false;
        std::vector<std::string> want2 = {"tessel call stack:", "  NULL == pHookTable (dlopen/loader:9)"};
        EXPECT_EQ(want2, ErrorModuleLines(mark2, &allErr2));
    });
}

TEST(ErrorReport, SettingAndAppendingLogNothing) {
    size_t mark = tessel_test::SyslogMark();
    TesselErrSetEx(1000, "hushed", 1, "hushed set %d", getpid());
    TesselErrAppendEx("hushed", 2, "hushed append %d", getpid());
    SyncSyslog(mark, "after setting");
    for (const tessel_test::SyslogLine &line : tessel_test::SyslogSince(mark)) {
        EXPECT_EQ(std::string::npos, line.message.find("hushed")) << line.raw;
    }
}

// The macros every module reports through: one log line with the condition
// and errno's text, then a frame; errno survives for the caller.
bool FailsWithRaise() {
    errno = ENOENT;
    TESSEL_CHECK(true, TESSEL_ERR_OPEN_FILE, "0 > fdLock", false);
    return true;
}

int FailsWithAppend() {
    errno = EACCES;
    TESSEL_CHECK_APPEND(!FailsWithRaise(), "!FailsWithRaise()", -1);
    return 0;
}

TEST(ReportMacros, LogLineThenFrame) {
    size_t mark = tessel_test::SyslogMark();
    EXPECT_EQ(-1, FailsWithAppend());
    EXPECT_EQ(ENOENT, errno);

    const Json::Value &jStack = TesselErrMsgGet();
    ASSERT_EQ(2u, jStack.size());
    EXPECT_EQ(TESSEL_ERR_OPEN_FILE, jStack[0u]["code"].asInt());
    EXPECT_EQ(kTesselModule, jStack[0u]["file"].asString());
    EXPECT_EQ("0 > fdLock", jStack[0u]["msg"].asString());
    EXPECT_FALSE(jStack[1u].isMember("code"));
    EXPECT_EQ("!FailsWithRaise()", jStack[1u]["msg"].asString());
    int rootLine = jStack[0u]["line"].asInt();
    int upLine = jStack[1u]["line"].asInt();

    std::string want1 = std::string(kTesselModule) + ":" + std::to_string(rootLine) +
                        " Failed [0 > fdLock], err=" + strerror(ENOENT);
    std::string want2 = std::string(kTesselModule) + ":" + std::to_string(upLine) +
                        " Failed [!FailsWithRaise()], err=" + strerror(ENOENT);
    std::optional<tessel_test::SyslogLine> line1 = tessel_test::WaitForSyslog(want1, mark);
    std::optional<tessel_test::SyslogLine> line2 = tessel_test::WaitForSyslog(want2, mark);
    ASSERT_TRUE(line1.has_value());
    ASSERT_TRUE(line2.has_value());
    EXPECT_EQ(want1, line1->message);
    EXPECT_EQ(LOG_ERR, line1->priority & 7);
    EXPECT_EQ(LOG_ERR, line2->priority & 7);
}

}  // namespace
