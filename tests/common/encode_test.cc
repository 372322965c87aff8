// Name encoding: exact forms, round trips over every byte value, and the
// refusal of malformed names.
#include <string.h>
#include <strings.h>
#include <syslog.h>

#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/sandbox.h"
#include "tessel_error.h"
#include "tessel_file.h"

namespace {

std::string Bytes(std::initializer_list<int> values) {
    std::string s;
    for (int v : values) {
        s.push_back(static_cast<char>(v));
    }
    return s;
}

// Decodes with the buffer form into a zero-filled buffer larger than needed
// and returns the bytes up to the last non-zero one plus the expected tail,
// so a wrong length shows as a difference.
bool DecodeBuffer(const std::string &strName, bool blBase64Only, size_t nExpected, std::string &strOut) {
    std::vector<unsigned char> buf(nExpected + 16, 0);
    if (!TesselDecode(strName, buf.data(), buf.size(), blBase64Only)) {
        return false;
    }
    for (size_t i = nExpected; i < buf.size(); ++i) {
        if (0 != buf[i]) {
            return false;  // wrote past the decoded data
        }
    }
    strOut.assign(reinterpret_cast<const char *>(buf.data()), nExpected);
    return true;
}

TEST(Encode, ExactForms) {
    struct Case {
        std::string in;
        bool base64Only;
        const char *out;
    } cases[] = {
        {"abc", false, "YWJ{106}"},
        {"abc", true, "YWJj"},
        {"a", false, "YQ{61}{61}"},
        {"a", true, "YQ=="},
        {"ab", false, "YWI{61}"},
        {"hello", false, "{97}GV{115}{98}G8{61}"},
        {Bytes({0xfb, 0xff}), false, "{43}{47}8{61}"},
        {Bytes({0xfb, 0xff}), true, "+/8="},
        {Bytes({0}), false, "AA{61}{61}"},
    };
    for (const Case &c : cases) {
        std::string out = "previous";
        ASSERT_TRUE(TesselEncode(c.in, out, c.base64Only)) << c.out;
        EXPECT_EQ(c.out, out);
        std::string out2;
        ASSERT_TRUE(TesselEncode(reinterpret_cast<const unsigned char *>(c.in.data()), c.in.size(), out2,
                                 c.base64Only));
        EXPECT_EQ(c.out, out2);
    }
}

TEST(Encode, RoundTripsEveryByteValue) {
    auto safe = [](const std::string &name) {
        return !name.empty() && std::string::npos == name.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789{}");
    };
    std::vector<std::string> inputs;
    for (int b = 0; b < 256; ++b) {
        inputs.push_back(std::string(1, static_cast<char>(b)));
    }
    std::string all;
    for (int b = 0; b < 256; ++b) {
        all.push_back(static_cast<char>(b));
    }
    inputs.push_back(all);
    // Every length modulo 3, with bytes from all over the range.
    for (size_t n = 2; n <= 67; ++n) {
        std::string s;
        for (size_t i = 0; i < n; ++i) {
            s.push_back(static_cast<char>((i * 97 + n * 31 + 7) & 0xff));
        }
        inputs.push_back(s);
    }
    for (bool base64Only : {false, true}) {
        for (const std::string &in : inputs) {
            std::string name;
            ASSERT_TRUE(TesselEncode(in, name, base64Only));
            if (!base64Only) {
                EXPECT_TRUE(safe(name)) << name;
            }
            std::string back;
            ASSERT_TRUE(DecodeBuffer(name, base64Only, in.size(), back)) << name;
            EXPECT_EQ(in, back) << name;
        }
    }
}

// The point of the escapes: names that differ only in case stay different
// on a file system that ignores case.
TEST(Encode, DistinctOnCaseInsensitiveFileSystems) {
    // "a" and 0xc9 are YQ== and yQ== in plain base64: one name on such a disk.
    std::string b1, b2;
    ASSERT_TRUE(TesselEncode(std::string("a"), b1, true));
    ASSERT_TRUE(TesselEncode(Bytes({0xc9}), b2, true));
    ASSERT_EQ(0, strcasecmp(b1.c_str(), b2.c_str())) << b1 << " vs " << b2;

    const std::string pairs[][2] = {
        {"a", Bytes({0xc9})}, {"a", "A"}, {"Readme", "README"}, {"field", "Field"}, {"x-y", "X-Y"}};
    for (const auto &pair : pairs) {
        std::string name1, name2;
        ASSERT_TRUE(TesselEncode(pair[0], name1));
        ASSERT_TRUE(TesselEncode(pair[1], name2));
        EXPECT_NE(0, strcasecmp(name1.c_str(), name2.c_str())) << name1 << " vs " << name2;
    }
}

TEST(Decode, TextFormStopsAtTheFirstZeroByte) {
    struct Case {
        std::string in;
        std::string want;
    } cases[] = {
        {"plain text", "plain text"},
        {Bytes({'a', 'b', 0, 'c', 'd'}), "ab"},
        {Bytes({0, 'x'}), ""},
        {Bytes({0xc3, 0xa9, 0x2f, 0x2e, 0x2e}), Bytes({0xc3, 0xa9, 0x2f, 0x2e, 0x2e})},
    };
    for (bool base64Only : {false, true}) {
        for (const Case &c : cases) {
            std::string name;
            ASSERT_TRUE(TesselEncode(c.in, name, base64Only));
            std::string out = "previous";
            ASSERT_TRUE(TesselDecode(name, out, base64Only)) << name;
            EXPECT_EQ(c.want, out) << name;
        }
    }
}

// Runs on a fresh thread so that frame 0 of the stack is this call's own.
struct Failure {
    bool result = true;
    int code = 0;
    Json::Value stack;
};

template <typename Fn>
Failure Fail(Fn fn) {
    Failure f;
    std::thread t([&] {
        f.result = fn();
        f.code = TesselErrCodeGet();
        f.stack = TesselErrMsgGet();
    });
    t.join();
    return f;
}

const char kBadEscape[] = "!isdigit((unsigned char)szStart[1]) || szStop != szEnd || 255 < ch";
const char kBadBase64[] =
    "!QLIBCBase64Decode((const char *)strResult.c_str(), strResult.length(), (char *)szOut, &nOut)";

TEST(Decode, MalformedNamesFailWithTheirCode) {
    struct Case {
        std::string in;
        bool base64Only;
        int code;  // -1: a frame without a code of its own
        const char *condition;
    } cases[] = {
        {"", false, 1015, "0 == strIn.length()"},
        {"", true, 1015, "0 == strIn.length()"},
        {"YWJ{106", false, -1, "NULL == szEnd"},
        {"{", false, -1, "NULL == szEnd"},
        {"YWJ{}", false, 1015, kBadEscape},
        {"YWJ{abc}", false, 1015, kBadEscape},
        {"YWJ{ 106}", false, 1015, kBadEscape},
        {"YWJ{-1}", false, 1015, kBadEscape},
        {"YWJ{362}", false, 1015, kBadEscape},  // 106 + 256 must not wrap to "j"
        {"YWJ{106x}", false, 1015, kBadEscape},
        {"YW{33}j", false, 1000, kBadBase64},   // "!" is no base64
        {"YWJ", false, 1000, kBadBase64},       // not whole groups
        {"YQ{61}", false, 1000, kBadBase64},    // padding cut short
        {"YWJ{106}", true, 1000, kBadBase64},   // escapes are not base64
        {"YW=j", true, 1000, kBadBase64},
        {Bytes({'Y', 'W', 0, 'J', 'j'}), false, 1000, kBadBase64},
        {Bytes({'Y', 'W', 'J', '{', '1', '0', 0, '6', '}'}), false, 1015, kBadEscape},
    };
    for (const Case &c : cases) {
        SCOPED_TRACE("name [" + c.in + "] base64Only " + std::to_string(c.base64Only));
        unsigned char buf[64] = {0};
        Failure f = Fail([&] { return TesselDecode(c.in, buf, sizeof(buf), c.base64Only); });
        EXPECT_FALSE(f.result);
        EXPECT_EQ(c.code, f.code);
        ASSERT_EQ(1u, f.stack.size());
        EXPECT_EQ(c.condition, f.stack[0u]["msg"].asString());
        EXPECT_EQ("common/tessel_common", f.stack[0u]["file"].asString());

        // The text form adds its own place on the way up.
        std::string in = c.in;
        std::string out = "kept";
        Failure g = Fail([&] { return TesselDecode(in, out, c.base64Only); });
        EXPECT_FALSE(g.result);
        EXPECT_EQ(c.code, g.code);
        ASSERT_EQ(2u, g.stack.size());
        EXPECT_EQ(c.condition, g.stack[0u]["msg"].asString());
        EXPECT_EQ("!TesselDecode(strIn, (unsigned char *)szOut, sizeof(szOut), blBase64Only)",
                  g.stack[1u]["msg"].asString());
        EXPECT_EQ("kept", out);
    }
}

TEST(Decode, OutputBufferTooSmall) {
    std::string name;
    ASSERT_TRUE(TesselEncode(std::string("abcdef"), name));
    unsigned char exact[6] = {0};
    EXPECT_TRUE(TesselDecode(name, exact, sizeof(exact)));
    EXPECT_EQ(0, memcmp("abcdef", exact, 6));
    unsigned char small[5] = {0};
    Failure f = Fail([&] { return TesselDecode(name, small, sizeof(small)); });
    EXPECT_FALSE(f.result);
    EXPECT_EQ(1000, f.code);
    EXPECT_EQ(kBadBase64, f.stack[0u]["msg"].asString());
}

TEST(Encode, EmptyInputIsABadParameter) {
    std::string out = "kept";
    Failure f1 = Fail([&] { return TesselEncode(nullptr, 3, out); });
    Failure f2 = Fail([&] { return TesselEncode(reinterpret_cast<const unsigned char *>("x"), 0, out, true); });
    Failure f3 = Fail([&] { return TesselEncode(std::string(), out); });
    for (const Failure &f : {f1, f2, f3}) {
        EXPECT_FALSE(f.result);
        EXPECT_EQ(1015, f.code);
        ASSERT_EQ(1u, f.stack.size());
        EXPECT_EQ("NULL == szIn || 0 == nIn", f.stack[0u]["msg"].asString());
    }
    EXPECT_EQ("kept", out);
}

TEST(Encode, FailuresAreLogged) {
    size_t mark = tessel_test::SyslogMark();
    std::string out;
    EXPECT_FALSE(TesselEncode(std::string(), out));
    std::string empty;
    EXPECT_FALSE(TesselDecode(empty, out));
    auto line1 = tessel_test::WaitForSyslog("Failed [NULL == szIn || 0 == nIn], err=", mark);
    auto line2 = tessel_test::WaitForSyslog(
        "Failed [!TesselDecode(strIn, (unsigned char *)szOut, sizeof(szOut), blBase64Only)], err=", mark);
    ASSERT_TRUE(line1.has_value());
    ASSERT_TRUE(line2.has_value());
    EXPECT_EQ(0u, line1->message.rfind("common/tessel_common:", 0)) << line1->message;
    EXPECT_EQ(LOG_ERR, line1->priority & 7);
}

}  // namespace
