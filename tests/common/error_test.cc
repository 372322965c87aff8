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
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "tessel_error.h"

static constexpr const char kTesselModule[] = "tests/common/error_test";

namespace {

using Lines = std::vector<std::string>;

// Runs fn on a new thread, whose error stack starts empty.
template <typename Fn>
void OnFreshThread(Fn fn) {
    std::thread(fn).join();
}

std::string ReadStream(FILE *f) {
    fflush(f);
    rewind(f);
    std::string text;
    char buf[4096];
    for (size_t n; 0 < (n = fread(buf, 1, sizeof(buf), f));) {
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
// "common/tessel_error:<line> " prefix; all of them must be at LOG_ERR.
Lines ErrorModuleLines(size_t mark) {
    static const std::string prefix = "common/tessel_error:";
    Lines lines;
    for (const tessel_test::SyslogLine &line : tessel_test::SyslogSince(mark)) {
        const std::string &msg = line.message;
        size_t digits = msg.find_first_not_of("0123456789", prefix.size());
        if (0 != msg.compare(0, prefix.size(), prefix) || std::string::npos == digits ||
            prefix.size() == digits || ' ' != msg[digits]) {
            continue;
        }
        lines.push_back(msg.substr(digits + 1));
        EXPECT_EQ(LOG_ERR, line.priority & 7) << line.raw;
    }
    return lines;
}

// Logs TesselErrSyslog's report and a unique line after it, and waits for
// that line, so that the whole report has reached the captured log.
Lines SyslogReport(const std::string &tag) {
    size_t mark = tessel_test::SyslogMark();
    TesselErrSyslog();
    std::string sentinel = "sync " + tag + " " + std::to_string(getpid());
    syslog(LOG_INFO, "%s", sentinel.c_str());
    EXPECT_TRUE(tessel_test::WaitForSyslog(sentinel, mark).has_value());
    return ErrorModuleLines(mark);
}

TEST(ErrorStack, IsPerThread) {
    TesselErrSetEx(1026, "common/tessel_conf", 10, "main thread");
    constexpr int kThreads = 4;
    pthread_barrier_t barrier;
    ASSERT_EQ(0, pthread_barrier_init(&barrier, NULL, kThreads));
    std::vector<std::thread> threads;
    std::vector<std::string> seen(kThreads);
    for (int i = 0; i < kThreads; ++i) {
        threads.emplace_back([&, i] {
            int start = tessel_test::ErrCode();
            TesselErrSetEx(1000 + i, "worker", i, "thread %d", i);
            TesselErrAppendEx("caller", 100 + i, "up from %d", i);
            // Every thread has set its error before any reads its own back.
            pthread_barrier_wait(&barrier);
            seen[i] = std::to_string(start) + "|" + std::to_string(tessel_test::ErrCode());
            for (const std::string &msg : tessel_test::ErrMsgs()) {
                seen[i] += "|" + msg;
            }
        });
    }
    for (std::thread &t : threads) {
        t.join();
    }
    pthread_barrier_destroy(&barrier);
    for (int i = 0; i < kThreads; ++i) {
        std::string n = std::to_string(i);
        EXPECT_EQ("0|" + std::to_string(1000 + i) + "|thread " + n + "|up from " + n, seen[i]);
    }
    EXPECT_EQ(1026, tessel_test::ErrCode());
    EXPECT_EQ(Lines{"main thread"}, tessel_test::ErrMsgs());
}

TEST(ErrorStack, FramesRootCauseFirstAndOnlySetClears) {
    TesselErrSetEx(1, "stale", 1, "stale");
    MakeThreeFrameError();
    EXPECT_EQ(tessel_test::Parse(R"([{"code":1008,"file":"object/object_get","line":120,"msg":"NULL == pObj"},)"
                                 R"j({"file":"object/object_list","line":45,"msg":"!Get(jParm)"},)j"
                                 R"({"file":"","line":7,"msg":""}])"),
              TesselErrMsgGet());
    TesselErrSetEx(1003, NULL, 0, NULL);
    EXPECT_EQ(tessel_test::Parse(R"([{"code":1003,"file":"","line":0,"msg":""}])"), TesselErrMsgGet());
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
        TesselErrAppendEx("f", 2, "<%s>", text.c_str());
        EXPECT_EQ((Lines{text, "<" + text + ">"}), tessel_test::ErrMsgs()) << "length " << length;
    }
    TesselErrSetEx(1000, "f", 1, "%d of %s, %u%%", -3, "seven", 7u);
    EXPECT_EQ(Lines{"-3 of seven, 7%"}, tessel_test::ErrMsgs());
}

TEST(ErrorStack, GetStringGivesTheInterfaceKeyNotTheMessage) {
    const char *kUntouched = "untouched";
    struct Case {
        int code;
        const char *key;      // expected result (nullptr: a null pointer)
        const char *section;  // expected section afterwards
    } cases[] = {
        {1000, "error_system", "common"}, {1008, nullptr, ""}, {1005, nullptr, ""},
        {1030, nullptr, ""},              {1031, nullptr, ""},
        // unknown codes, or codes without a table entry: section place left alone
        {999, "", kUntouched}, {1032, "", kUntouched}, {902, "", kUntouched}, {0, "", kUntouched},
    };
    for (const Case &c : cases) {
        const char *szSection = kUntouched;
        const char *szKey = TesselErrGetString(c.code, &szSection);
        EXPECT_EQ(nullptr == c.key, nullptr == szKey) << c.code;
        EXPECT_STREQ(c.key, szKey) << c.code;
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
        {1032, ""}, {900, ""}, {999, ""},
    };
    for (const Case &c : cases) {
        TesselErrSetEx(c.code, "common/tessel_conf", 33, "!jConf.isObject()");
        EXPECT_EQ(std::string("tessel call stack:\n  !jConf.isObject() (common/tessel_conf:33)\n") + c.errnoLine,
                  PrintedReport());
    }
}

TEST(ErrorReport, PrintWithoutCodeOrWithMissingMembers) {
    OnFreshThread([] {
        EXPECT_EQ("", PrintedReport()) << "an empty stack prints nothing";
        TesselErrAppendEx("lock/tessel_lock", 12, "!ReadLock()");
        EXPECT_EQ("tessel call stack:\n  !ReadLock() (lock/tessel_lock:12)\n", PrintedReport());
        // An application may edit its stack; missing members print as placeholders.
        TesselErrSetEx(1001, "x", 5, "y");
        TesselErrMsgGet()[0u] = tessel_test::Parse(R"({"code":1001})");
        EXPECT_EQ("tessel call stack:\n  ---- (----:0)\n  ErrNo=[1001] (Lock failed.)\n", PrintedReport());
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
    EXPECT_EQ((Lines{"tessel call stack:", "   (:7)", "  !Get(jParm) (object/object_list:45)",
                     "  NULL == pObj (object/object_get:120)", "  ErrNo=[1008] (Object not exists.)"}),
              SyslogReport("three"));
    OnFreshThread([] {
        EXPECT_EQ(Lines{}, SyslogReport("empty"));
        // Without a code in frame 0, no ErrNo line.
        TesselErrAppendEx("dlopen/loader", 9, "NULL == pHookTable");
        EXPECT_EQ((Lines{"tessel call stack:", "  NULL == pHookTable (dlopen/loader:9)"}), SyslogReport("nocode"));
    });
}

TEST(ErrorReport, SettingAndAppendingLogNothing) {
    size_t mark = tessel_test::SyslogMark();
    TesselErrSetEx(1000, "hushed", 1, "hushed set %d", getpid());
    TesselErrAppendEx("hushed", 2, "hushed append %d", getpid());
    std::string sentinel = "sync after setting " + std::to_string(getpid());
    syslog(LOG_INFO, "%s", sentinel.c_str());
    ASSERT_TRUE(tessel_test::WaitForSyslog(sentinel, mark).has_value());
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
    EXPECT_EQ(TESSEL_ERR_OPEN_FILE, tessel_test::ErrCode());
    EXPECT_EQ((Lines{"0 > fdLock", "!FailsWithRaise()"}), tessel_test::ErrMsgs());
    const Json::Value &jStack = TesselErrMsgGet();
    EXPECT_FALSE(jStack[1u].isMember("code"));
    for (const Json::Value &jFrame : jStack) {
        EXPECT_EQ(kTesselModule, jFrame["file"].asString());
        std::string want = std::string(kTesselModule) + ":" + std::to_string(jFrame["line"].asInt()) + " Failed [" +
                           jFrame["msg"].asString() + "], err=" + strerror(ENOENT);
        std::optional<tessel_test::SyslogLine> line = tessel_test::WaitForSyslog(want, mark);
        ASSERT_TRUE(line.has_value()) << want;
        EXPECT_EQ(want, line->message);
        EXPECT_EQ(LOG_ERR, line->priority & 7);
    }
}

}  // namespace
