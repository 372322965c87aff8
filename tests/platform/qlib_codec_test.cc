// Base64 against OpenSSL's own encoder, and UTF-8 upper-casing.
#include <locale.h>
#include <string.h>

#include <memory>
#include <random>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <openssl/evp.h>

#include "quor/qlib.h"

namespace {

std::string Encode(const std::string &in, bool lineBreak = false) {
    std::vector<char> out(in.size() * 2 + 8);
    if (!QLIBCBase64SzEncodeFull(reinterpret_cast<const unsigned char *>(in.data()), in.size(), out.data(), out.size(),
                                 lineBreak ? TRUE : FALSE)) {
        return "<failed>";
    }
    return std::string(out.data());
}

// The decoded bytes; *pOk tells whether decoding succeeded.
std::string Decode(const std::string &text, bool *pOk, size_t capacity = 1024) {
    std::vector<char> out(capacity + 1, '#');
    size_t n = capacity;
    *pOk = QLIBCBase64Decode(text.data(), text.size(), out.data(), &n);
    return *pOk ? std::string(out.data(), n) : std::string();
}

std::string OpenSslEncode(const std::string &in) {
    std::vector<unsigned char> out((in.size() + 2) / 3 * 4 + 1);
    EVP_EncodeBlock(out.data(), reinterpret_cast<const unsigned char *>(in.data()), static_cast<int>(in.size()));
    return std::string(reinterpret_cast<char *>(out.data()));
}

TEST(Base64, EncodesShortInputsExactly) {
    // Every length class of the last group, padding included.
    const char *expected[] = {"", "Zg==", "Zm8=", "Zm9v", "Zm9vYg==", "Zm9vYmE="};
    for (size_t n = 0; n <= 5; ++n) {
        std::string in = std::string("fooba").substr(0, n);
        EXPECT_EQ(expected[n], Encode(in)) << n;
        bool ok = false;
        EXPECT_EQ(in, Decode(expected[n], &ok)) << n;
        EXPECT_TRUE(ok) << n;
    }
}

TEST(Base64, RoundTripsArbitraryBytesLikeOpenSsl) {
    std::mt19937 rng(20240611);
    for (size_t n = 0; n < 300; ++n) {
        std::string in(n, '\0');
        for (char &c : in) {
            c = static_cast<char>(rng() & 0xFF);
        }
        std::string text = Encode(in);
        ASSERT_EQ(OpenSslEncode(in), text) << n;
        bool ok = false;
        ASSERT_EQ(in, Decode(text, &ok)) << n;
        ASSERT_TRUE(ok);
    }
}

TEST(Base64, EncodeNeedsRoomForTextAndTerminator) {
    const unsigned char in[] = {1, 2, 3, 4};  // "AQIDBA==": 8 characters
    // Exactly the size the callers compute: ((n + 2) / 3 * 4) | 1.
    size_t exact = ((sizeof(in) + 2) / 3 * 4) | 1;
    ASSERT_EQ(9u, exact);
    std::unique_ptr<char[]> buf(new char[exact]);
    ASSERT_TRUE(QLIBCBase64SzEncodeFull(in, sizeof(in), buf.get(), exact, FALSE));
    EXPECT_STREQ("AQIDBA==", buf.get());

    // One short: refused, and the heap buffer of that size is not overrun
    // (the sanitizer build catches any write past it).
    std::unique_ptr<char[]> small(new char[exact - 1]);
    QLIBCErrClear();
    EXPECT_FALSE(QLIBCBase64SzEncodeFull(in, sizeof(in), small.get(), exact - 1, FALSE));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    EXPECT_EQ('\0', small[0]);

    QLIBCErrClear();
    EXPECT_FALSE(QLIBCBase64SzEncodeFull(NULL, 3, buf.get(), exact, FALSE));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    char one[1] = {'x'};
    EXPECT_TRUE(QLIBCBase64SzEncodeFull(in, 0, one, sizeof(one), FALSE));
    EXPECT_EQ('\0', one[0]);
}

TEST(Base64, LineBreaksEvery76Characters) {
    std::string in(200, '\0');
    for (size_t i = 0; i < in.size(); ++i) {
        in[i] = static_cast<char>(i * 7);
    }
    // 57 bytes fill one line exactly: no newline at all.
    EXPECT_EQ(std::string::npos, Encode(in.substr(0, 57), true).find('\n'));
    std::string text = Encode(in, true);  // 268 characters: 76 + 76 + 76 + 40
    std::string flat = OpenSslEncode(in);
    ASSERT_EQ(268u, flat.size());
    EXPECT_EQ(flat.substr(0, 76) + "\n" + flat.substr(76, 76) + "\n" + flat.substr(152, 76) + "\n" + flat.substr(228),
              text);

    // The size check counts the newlines: text + 3 newlines + terminator.
    std::vector<char> exact(268 + 3 + 1);
    EXPECT_TRUE(QLIBCBase64SzEncodeFull(reinterpret_cast<const unsigned char *>(in.data()), in.size(), exact.data(),
                                        exact.size(), TRUE));
    std::unique_ptr<char[]> small(new char[268 + 3]);
    EXPECT_FALSE(QLIBCBase64SzEncodeFull(reinterpret_cast<const unsigned char *>(in.data()), in.size(), small.get(),
                                         268 + 3, TRUE));

    // Broken lines, also with CR LF, decode to the same bytes.
    bool ok = false;
    EXPECT_EQ(in, Decode(text, &ok));
    EXPECT_TRUE(ok);
    std::string crlf;
    for (char c : text) {
        crlf += ('\n' == c) ? std::string("\r\n") : std::string(1, c);
    }
    EXPECT_EQ(in, Decode(crlf + "\r\n", &ok));
    EXPECT_TRUE(ok);
}

TEST(Base64, DecodeRefusesMalformedText) {
    const char *bad[] = {
        "Zg=",        // not a whole group
        "Zm9",        // unpadded
        "Zg==Zg==",   // data after padding
        "Z===",       // too much padding
        "====",
        "Zm9v!A==",   // foreign character
        "Zm-v",       // URL-safe alphabet
        "Zm9vYmE=\x01",
    };
    for (const char *text : bad) {
        bool ok = true;
        QLIBCErrClear();
        Decode(text, &ok);
        EXPECT_FALSE(ok) << text;
        EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet()) << text;
    }
    // A zero byte inside the given length is not the end of the text.
    const char withNul[] = {'Z', 'g', '=', '=', '\0', 'Z', 'g', '='};
    char out[8];
    size_t n = sizeof(out);
    EXPECT_FALSE(QLIBCBase64Decode(withNul, sizeof(withNul), out, &n));
}

TEST(Base64, DecodeHonoursTheCapacity) {
    // "Zm8=" holds 2 bytes although its groups span 3: the padding must not
    // count, in the length returned or in the room needed.
    std::unique_ptr<char[]> two(new char[2]);
    size_t n = 2;
    ASSERT_TRUE(QLIBCBase64Decode("Zm8=", 4, two.get(), &n));
    EXPECT_EQ(2u, n);
    EXPECT_EQ(0, memcmp("fo", two.get(), 2));

    n = 2;
    QLIBCErrClear();
    EXPECT_FALSE(QLIBCBase64Decode("Zm9v", 4, two.get(), &n));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());

    // The length given is what is read: the rest of the string is ignored.
    n = 2;
    ASSERT_TRUE(QLIBCBase64Decode("Zm8=Zm9v", 4, two.get(), &n));
    EXPECT_EQ(2u, n);

    n = 0;
    EXPECT_TRUE(QLIBCBase64Decode("", 0, NULL, &n));
    EXPECT_EQ(0u, n);
    QLIBCErrClear();
    EXPECT_FALSE(QLIBCBase64Decode("Zm9v", 4, two.get(), NULL));
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
}

std::string Upper(const std::string &in, size_t cbOut = 256, int *pRet = nullptr) {
    std::unique_ptr<char[]> out(new char[cbOut]);
    int ret = QLIBCUTF8StrToUpper(in.c_str(), out.get(), cbOut);
    if (nullptr != pRet) {
        *pRet = ret;
    }
    return (0 == ret) ? std::string(out.get()) : std::string("<failed>");
}

TEST(Utf8Upper, MapsEveryScriptWhateverTheProcessLocale) {
    // The test program runs in the "C" locale, where toupper() knows ASCII only.
    ASSERT_STREQ("C", setlocale(LC_CTYPE, NULL));
    EXPECT_EQ("HELLO, WORLD 42", Upper("Hello, World 42"));
    EXPECT_EQ("\xC3\x89T\xC3\x89", Upper("\xC3\xA9t\xC3\xA9"));                     // été
    EXPECT_EQ("\xCE\xA3\xCE\xA3", Upper("\xCF\x83\xCF\x82"));                       // σς
    EXPECT_EQ("\xD0\x96\xD0\x98\xD0\x97\xD0\x9D\xD0\xAC",                         // жизнь
              Upper("\xD0\xB6\xD0\xB8\xD0\xB7\xD0\xBD\xD1\x8C"));
    EXPECT_EQ("\xF0\x90\x90\x80", Upper("\xF0\x90\x90\xA8"));                       // Deseret, 4 bytes
    EXPECT_EQ("\xEF\xBC\xA1", Upper("\xEF\xBD\x81"));                               // fullwidth a
    EXPECT_EQ("\xE6\x97\xA5\xE6\x9C\xAC", Upper("\xE6\x97\xA5\xE6\x9C\xAC"));       // no case
    // Simple mapping: sharp s has no single upper-case letter and stays.
    EXPECT_EQ("STRA\xC3\x9F" "E", Upper("stra\xC3\x9F" "e"));
    EXPECT_EQ("", Upper(""));
    // The thread's locale is left as it was.
    EXPECT_EQ(LC_GLOBAL_LOCALE, uselocale(static_cast<locale_t>(0)));
}

TEST(Utf8Upper, LengthMayChangeAndTheBufferIsChecked) {
    EXPECT_EQ("I", Upper("\xC4\xB1"));                   // dotless i: 2 bytes to 1
    EXPECT_EQ("\xE2\xB1\xAF", Upper("\xC9\x90"));        // turned a: 2 bytes to 3
    int ret = 0;
    EXPECT_EQ("\xE2\xB1\xAF", Upper("\xC9\x90", 4, &ret));
    EXPECT_EQ(0, ret);
    QLIBCErrClear();
    Upper("\xC9\x90", 3, &ret);
    EXPECT_EQ(-1, ret);
    EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
    Upper("abc", 3, &ret);
    EXPECT_EQ(-1, ret);
    EXPECT_EQ("ABC", Upper("abc", 4, &ret));
}

TEST(Utf8Upper, RefusesInvalidUtf8) {
    const char *bad[] = {
        "\x80",                  // lone continuation byte
        "ab\xC3",                // cut short
        "\xC3(",                 // missing continuation
        "\xC0\xAF",              // overlong '/'
        "\xE0\x80\xAF",          // overlong, 3 bytes
        "\xED\xA0\x80",          // UTF-16 surrogate
        "\xF4\x90\x80\x80",      // beyond U+10FFFF
        "\xF8\x88\x80\x80\x80",  // old 5-byte form
        "\xFF",
    };
    for (const char *text : bad) {
        char out[64];
        memset(out, 'x', sizeof(out));
        QLIBCErrClear();
        EXPECT_EQ(-1, QLIBCUTF8StrToUpper(text, out, sizeof(out))) << text;
        EXPECT_EQ(QLIBC_ERR_BAD_PARAMETERS, QLIBCErrGet());
        EXPECT_EQ('\0', out[0]) << "no partial result";
    }
    char out[8];
    EXPECT_EQ(-1, QLIBCUTF8StrToUpper(NULL, out, sizeof(out)));
    EXPECT_EQ(-1, QLIBCUTF8StrToUpper("a", NULL, 8));
    EXPECT_EQ(-1, QLIBCUTF8StrToUpper("a", out, 0));
}

}  // namespace
