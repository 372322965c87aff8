// Filling SQL templates: the markers, the refusals, and the proof that the
// escaped text means to the server exactly what the caller passed.
#include <stdlib.h>

#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>
#include <libpq-fe.h>

#include "platform/db_test_scratch.h"
#include "platform/quor_test_files.h"
#include "quor/quor_db.h"
#include "support/sandbox.h"

namespace {

using quor_test::PlatformErrorIs;

// The filled template as a string ("<null>" when refused).
template <typename... Args>
std::string Fill(const char *tmpl, Args... args) {
    char *sql = QUORDBEscapeStringEX3(QUOR_DB_PGSQL, tmpl, args...);
    if (nullptr == sql) {
        return "<null>";
    }
    std::string text = sql;
    free(sql);
    return text;
}

TEST(DbTemplate, MarkersAreFilledInOrder) {
    EXPECT_EQ("a='x''y' b=9223372036854775807 c=-5 d='z'",
              Fill("a='@QUOR:VAR' b=@QUOR:LLINT c=@QUOR:INT d='@QUOR:VAR'", "x'y", 9223372036854775807LL, -5, "z"));
    EXPECT_EQ("-9223372036854775808 2147483647 -2147483648",
              Fill("@QUOR:LLINT @QUOR:INT @QUOR:INT", static_cast<long long>(-9223372036854775807LL - 1), 2147483647,
                   static_cast<int>(-2147483647 - 1)));
    EXPECT_EQ("no markers", Fill("no markers"));
    EXPECT_EQ("", Fill(""));
}

TEST(DbTemplate, MarkersMatchExactly) {
    // A marker followed by more letters is the marker and then those letters.
    EXPECT_EQ("(binary_info->'photo.jpg') IS NOT NULL",
              Fill("(@QUOR:VAR_info->'@QUOR:VAR') IS NOT NULL", "binary", "photo.jpg"));
    EXPECT_EQ("7EGER 8S", Fill("@QUOR:INTEGER @QUOR:VARS", 7, "8"));
    // Anything else that starts with '@' is text.
    EXPECT_EQ("@QUOR:var @QUOR: @QUOR @ user@host @@", Fill("@QUOR:var @QUOR: @QUOR @ user@host @@"));
    // Filled text is not searched for markers again.
    EXPECT_EQ("'@QUOR:INT' 3", Fill("'@QUOR:VAR' @QUOR:INT", "@QUOR:INT", 3));
}

TEST(DbTemplate, OnlyQuotesAreDoubled) {
    // With standard_conforming_strings a backslash in '...' is an ordinary
    // character; doubling it would change the text.
    EXPECT_EQ("'a\\b'", Fill("'@QUOR:VAR'", "a\\b"));
    EXPECT_EQ("'\\'''", Fill("'@QUOR:VAR'", "\\'"));
    EXPECT_EQ("''''''", Fill("'@QUOR:VAR'", "''"));
    EXPECT_EQ("'\"x\" $$ %s'", Fill("'@QUOR:VAR'", "\"x\" $$ %s"));
}

TEST(DbTemplate, RefusesTextThatIsNotUtf8) {
    const std::vector<std::string> invalid = {
        "\x80",                   // continuation byte alone
        "abc\xc3",                // sequence cut by the end
        "\xc3(",                  // sequence cut by an ASCII byte
        "\xc0\xaf",               // overlong '/'
        "\xc1\xbf",               // overlong
        "\xe0\x80\xaf",           // overlong, three bytes
        "\xf0\x80\x80\xaf",       // overlong, four bytes
        "\xed\xa0\x80",           // UTF-16 surrogate
        "\xf4\x90\x80\x80",       // above U+10FFFF
        "\xf5\x80\x80\x80",       // no such lead byte
        "\xff",                   // never in UTF-8
        "ok' \xe2\x82",           // cut multi-byte sequence after a quote
    };
    for (const std::string &text : invalid) {
        QLIBCErrClear();
        EXPECT_EQ("<null>", Fill("SELECT '@QUOR:VAR', @QUOR:INT", text.c_str(), 1)) << testing::PrintToString(text);
        EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    }
    for (const char *text : {"\xc2\x80", "\xdf\xbf", "\xe0\xa0\x80", "\xed\x9f\xbf", "\xee\x80\x80",
                             "\xf0\x90\x80\x80", "\xf4\x8f\xbf\xbf", "\xc3\xa9\xe4\xb8\xad\xf0\x9f\x98\x80"}) {
        EXPECT_EQ(std::string("'") + text + "'", Fill("'@QUOR:VAR'", text)) << testing::PrintToString(text);
    }
}

TEST(DbTemplate, BadArgumentsAreRecorded) {
    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBEscapeStringEX3(QUOR_DB_PGSQL, nullptr));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBEscapeStringEX3(QUOR_DB_PGSQL + 1, "'@QUOR:VAR'", "x"));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
    QLIBCErrClear();
    EXPECT_EQ(nullptr, QUORDBEscapeStringEX3(QUOR_DB_PGSQL, "'@QUOR:VAR'", static_cast<const char *>(nullptr)));
    EXPECT_TRUE(PlatformErrorIs(QLIBC_ERR_BAD_PARAMETERS, "quor_db.cc"));
}

// Texts that break naive quoting, and texts beyond ASCII.
const std::vector<std::string> &Tricky() {
    static const std::vector<std::string> texts = {
        "it's",
        "''",
        "\\",
        "trailing backslash\\",
        "\\'",
        "a\\'b",
        "'); DROP TABLE victim; --",
        "\\'); DROP TABLE victim; --",
        "x' OR '1'='1",
        "E'\\x41'",
        "$$dollar$$ $tag$",
        "\"double\" quotes",
        "line\nbreak\ttab\rreturn",
        "%s %d _ %",
        "@QUOR:VAR",
        "\xc3\xa9t\xc3\xa9 \xe4\xb8\xad\xe6\x96\x87 \xf0\x9f\x98\x80 \xf4\x8f\xbf\xbf",
        "{\"json\": \"with \\\"escaped\\\" quotes and \\\\ backslash\"}",
    };
    return texts;
}

using DbEscapeRoundTrip = quor_test::ScratchDbTest;

TEST_F(DbEscapeRoundTrip, TheServerReadsBackExactlyTheText) {
    for (const std::string &text : Tricky()) {
        std::string sql = Fill("SELECT '@QUOR:VAR' AS v, @QUOR:INT AS n", text.c_str(), 42);
        ASSERT_NE("<null>", sql) << text;
        EXPECT_EQ(text, Value(sql, "v")) << sql;
        EXPECT_EQ("42", Value(sql, "n")) << sql;
    }
}

TEST_F(DbEscapeRoundTrip, StoredTextIsWhatWasPassedAndNothingElseRuns) {
    ASSERT_EQ(0, QUORDBExecute(conn_,
                               "CREATE TABLE victim(keep int); INSERT INTO victim VALUES (1);"
                               "CREATE TABLE stored(id bigint PRIMARY KEY, body text, info json)",
                               nullptr));
    long long id = 0;
    for (const std::string &text : Tricky()) {
        ++id;
        std::string json = "{\"n\": " + std::to_string(id) + "}";
        char *sql = QUORDBEscapeStringEX3(QUOR_DB_PGSQL,
                                          "INSERT INTO stored(id, body, info) VALUES (@QUOR:LLINT, '@QUOR:VAR', "
                                          "'@QUOR:VAR'); UPDATE stored SET body = body WHERE id = @QUOR:LLINT",
                                          id, text.c_str(), json.c_str(), id);
        ASSERT_NE(nullptr, sql) << text;
        EXPECT_EQ(0, QUORDBExecute(conn_, sql, nullptr)) << sql;
        free(sql);
    }
    // Read back over a separate plain libpq connection, not through the wrapper.
    PGconn *direct = tessel_test::PgConnect(quor_test::kScratchDb);
    ASSERT_NE(nullptr, direct);
    id = 0;
    for (const std::string &text : Tricky()) {
        ++id;
        const char *params[1];
        std::string idText = std::to_string(id);
        params[0] = idText.c_str();
        PGresult *res = PQexecParams(direct, "SELECT body FROM stored WHERE id = $1", 1, nullptr, params, nullptr,
                                     nullptr, 0);
        ASSERT_EQ(PGRES_TUPLES_OK, PQresultStatus(res));
        ASSERT_EQ(1, PQntuples(res)) << text;
        EXPECT_EQ(text, std::string(PQgetvalue(res, 0, 0)));
        PQclear(res);
    }
    EXPECT_EQ(std::optional<std::string>(std::to_string(Tricky().size())),
              tessel_test::PgValue(direct, "SELECT count(*) FROM stored"));
    EXPECT_EQ(std::optional<std::string>("1"), tessel_test::PgValue(direct, "SELECT count(*) FROM victim"));
    PQfinish(direct);
    EXPECT_EQ(0, QUORDBExecute(conn_, "DROP TABLE stored; DROP TABLE victim", nullptr));
}

TEST_F(DbEscapeRoundTrip, JsonTextWithBackslashesIsStoredAsValidJson) {
    // JSON columns hold compact JSON text full of backslash escapes; the
    // server must parse exactly that text.
    const std::string json = "{\"a\":\"quote \\\" backslash \\\\ newline \\n it's\",\"b\":[1,\"\\u00e9\"]}";
    std::string sql = Fill("SELECT ('@QUOR:VAR'::json)->>'a' AS a, ('@QUOR:VAR'::json)->'b'->>1 AS b", json.c_str(),
                           json.c_str());
    EXPECT_EQ("quote \" backslash \\ newline \n it's", Value(sql, "a"));
    EXPECT_EQ("\xc3\xa9", Value(sql, "b"));
}

}  // namespace
