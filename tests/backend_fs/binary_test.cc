// Stored files of the file-system store: digests, file descriptions, the
// meta-binary formats of a save, and downloads written to standard output the
// way a gateway (CGI) program writes its response.
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <initializer_list>
#include <map>
#include <memory>
#include <string>
#include <tuple>
#include <vector>

#include <gtest/gtest.h>

#include "common/tessel_json.h"
#include "support/error_stack.h"
#include "support/json_text.h"
#include "support/sandbox.h"
#include "support/scratch.h"
#include <quor/qlib.h>

#include "tessel_backend.h"
#include "tessel_binary.h"
#include "tessel_file.h"
#include "tesselobject.h"

using namespace tessel_test;
namespace fs = std::filesystem;

namespace {

const std::string kNsDir = "/volume1/@Tessel/ledger";
using Msgs = std::vector<std::string>;

std::string Md5Of(const std::string &strPath) {
    std::string strMd5;
    EXPECT_TRUE(TesselObjectEvalFileMd5(strPath.c_str(), strMd5)) << ::testing::PrintToString(ErrMsgs());
    return strMd5;
}

std::string Encoded(const std::string &strName) {
    std::string strOut;
    EXPECT_TRUE(TesselEncode(strName, strOut));
    return strOut;
}

std::vector<std::string> Entries(const std::string &strDir) {
    std::vector<std::string> names;
    for (const auto &entry : fs::directory_iterator(strDir)) {
        names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

TEST(FileDigest, KnownDigestsAndUnreadableFiles) {
    ScratchDir dir;
    ASSERT_TRUE(dir.ok());
    // RFC 1321's test suite; the million "a" spans many 1024-byte blocks.
    const std::vector<std::pair<std::string, std::string>> cases = {
        {"", "d41d8cd98f00b204e9800998ecf8427e"},
        {"message digest", "f96b697d7cb7938d525a2f31aaf161d0"},
        {"12345678901234567890123456789012345678901234567890123456789012345678901234567890",
         "57edf4a22be3c955ac49da2e2107b67a"},
        {std::string(1000000, 'a'), "7707d6ae4e027c70eea2a935c2296f21"},
    };
    for (const auto &c : cases) {
        ASSERT_TRUE(WriteFile(dir.file("data"), c.first));
        EXPECT_EQ(c.second, Md5Of(dir.file("data"))) << c.first.size();
    }

    std::string strMd5 = "kept?";
    ErrClear();
    EXPECT_FALSE(TesselObjectEvalFileMd5(dir.file("missing").c_str(), strMd5));
    EXPECT_EQ(TESSEL_ERR_OPEN_FILE, ErrCode());
    EXPECT_EQ(Msgs{"NULL == (inFile = fopen (szPath, \"rb\"))"}, ErrMsgs());
    EXPECT_EQ("", strMd5);
    // A directory opens but cannot be read.
    ErrClear();
    EXPECT_FALSE(TesselObjectEvalFileMd5(dir.path().c_str(), strMd5));
    EXPECT_EQ(TESSEL_ERR_OPEN_FILE, ErrCode());
    EXPECT_EQ(Msgs{"ferror(inFile)"}, ErrMsgs());
}

// What a download wrote to standard output, and how it ended.
struct Response {
    bool ok = false;
    std::string out;
    Json::Value stack;
};

class MetaBinary : public ::testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(0, system(("mkdir -p " + kNsDir + " /usr/quor/etc/tessel/ns && ln -sfn " + kNsDir +
                             " /usr/quor/etc/tessel/ns/ledger")
                                .c_str()));
        ASSERT_TRUE(upload_.ok());
        ASSERT_NE(nullptr, backend_);
        ErrClear();
    }

    static Json::Value Req(const std::string &strId, const std::string &strMembers) {
        Json::Value jParm = Parse("{" + strMembers + "}");
        jParm["ns"] = "ledger";
        if (!strId.empty()) {
            jParm["id"] = strId;
        }
        return jParm;
    }

    // An object of alice's holding nothing but its basic fields.
    std::string Create() {
        std::string strId, strVer;
        EXPECT_TRUE(backend_->Create(Req("", R"("owner": 1001, "category": "note", "ctime": 100)"), strId, strVer))
            << ::testing::PrintToString(ErrMsgs());
        return strId;
    }

    // Saves the meta-binary items. The request carries no "mtime" (that
    // would make it a versioned save), so it counts as made now.
    bool Save(const std::string &strId, const Json::Value &jFiles) {
        Json::Value jParm = Req(strId, R"("version": "0123456789012345678901234567890123456789")");
        jParm["metabinary_files"] = jFiles;
        ErrClear();
        return backend_->Set(jParm, ver_);
    }

    static Json::Value Items(std::initializer_list<Json::Value> items) {
        Json::Value jFiles(Json::arrayValue);
        for (const Json::Value &jItem : items) {
            jFiles.append(jItem);
        }
        return jFiles;
    }

    // An uploaded file holding strData, as an item of the given format.
    Json::Value Upload(const std::string &strName, const std::string &strFormat, const std::string &strData) {
        const std::string strPath = upload_.file("up" + std::to_string(uploads_++));
        EXPECT_TRUE(WriteFile(strPath, strData));
        Json::Value jItem(Json::objectValue);
        jItem["name"] = strName;
        jItem["format"] = strFormat;
        jItem["path"] = strPath;
        return jItem;
    }

    std::string DataPath(const std::string &strId, const std::string &strName) {
        return kNsDir + "/" + strId + "/metabinary/" + Encoded(strName);
    }
    std::string InfoPath(const std::string &strId, const std::string &strName) {
        return kNsDir + "/" + strId + "/metabinary_info/" + Encoded(strName);
    }

    // Runs the download in a child whose standard output goes to a file and
    // whose environment holds env.
    Response Download(const Json::Value &jParm, const std::map<std::string, std::string> &env = {}) {
        ScratchDir dir;
        EXPECT_TRUE(dir.ok());
        const std::string strOut = dir.file("stdout");
        const std::string strStack = dir.file("stack");
        const int rc = RunInChild([&]() {
            unsetenv("HTTP_IF_NONE_MATCH");
            unsetenv("HTTP_USER_AGENT");
            for (const auto &kv : env) {
                setenv(kv.first.c_str(), kv.second.c_str(), 1);
            }
            fflush(stdout);
            const int fd = open(strOut.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
            if (fd < 0 || dup2(fd, STDOUT_FILENO) < 0) {
                return 99;
            }
            ErrClear();
            std::unique_ptr<TESSEL_BACKEND_OP> backend(RegisterBackend::New("fs"));
            const bool ok = backend->Download(jParm);
            fflush(stdout);
            return tessel::toFile(TesselErrMsgGet(), strStack) ? (ok ? 0 : 1) : 98;
        });
        EXPECT_TRUE(0 == rc || 1 == rc) << rc;
        return {0 == rc, ReadFile(strOut), ReadJson(strStack)};
    }

    static Msgs FrameMsgs(const Json::Value &jStack) {
        Msgs msgs;
        for (const Json::Value &jFrame : jStack) {
            msgs.push_back(jFrame["msg"].asString());
        }
        return msgs;
    }

    ScratchDir upload_{"/tmp"};
    int uploads_ = 0;
    std::string ver_;
    std::unique_ptr<TESSEL_BACKEND_OP> backend_{RegisterBackend::New("fs")};
};

TEST_F(MetaBinary, SaveStoresDescribesCopiesAndDeletes) {
    const std::string strId = Create();
    const std::string strOther = Create();
    const Json::Value jFiles =
        Items({Upload("photo.png", "raw", std::string("\x89PNG\0\r\n", 7)), Upload("note.txt", "base64", "aGVs\nbG8=\n")});
    const long long before = time(NULL);
    ASSERT_TRUE(Save(strId, jFiles)) << ::testing::PrintToString(ErrMsgs());
    const long long after = time(NULL);

    EXPECT_EQ(std::string("\x89PNG\0\r\n", 7), ReadFile(DataPath(strId, "photo.png")));
    EXPECT_EQ("hello", ReadFile(DataPath(strId, "note.txt")));
    struct stat st;
    ASSERT_EQ(0, stat(DataPath(strId, "photo.png").c_str(), &st));
    EXPECT_EQ(0640u, st.st_mode & 07777);
    const Json::Int64 saved = ReadJson(InfoPath(strId, "photo.png"))["auto_mtime"].asInt64();
    EXPECT_LE(before, saved);
    EXPECT_GE(after, saved);
    EXPECT_EQ(Parse(R"({"md5": ")" + Md5Of(DataPath(strId, "photo.png")) + R"(", "name": "photo.png", "auto_mtime": )" +
                    std::to_string(saved) + "}"),
              ReadJson(InfoPath(strId, "photo.png")));
    EXPECT_EQ(Parse(R"({"md5": "5d41402abc4b2a76b9719d911017c592", "name": "note.txt", "auto_mtime": )" +
                    std::to_string(saved) + "}"),
              ReadJson(InfoPath(strId, "note.txt")));
    // Whole files only: no temporary left beside them, no work area left in
    // the namespace's scratch directory.
    Msgs sorted = {Encoded("note.txt"), Encoded("photo.png")};
    std::sort(sorted.begin(), sorted.end());
    EXPECT_EQ(sorted, Entries(kNsDir + "/" + strId + "/metabinary"));
    EXPECT_EQ(sorted, Entries(kNsDir + "/" + strId + "/metabinary_info"));
    EXPECT_EQ(Msgs{}, Entries("/volume1/@tmp/@Tessel/ledger"));

    // The read side: all of them, or those selected.
    {
        TESSEL_OBJECT obj;
        ASSERT_TRUE(backend_->Get(Req(strId, R"("field": {"metabinary_info": true})"), &obj));
        EXPECT_EQ(2u, obj.get_metabinary_info().size());
        EXPECT_EQ(ReadJson(InfoPath(strId, "note.txt")), obj.get_metabinary_info()["note.txt"]);
        EXPECT_EQ(ReadJson(InfoPath(strId, "photo.png")), obj.get_metabinary_info()["photo.png"]);
        TESSEL_OBJECT one;
        ASSERT_TRUE(backend_->Get(Req(strId, R"("field": {"metabinary_info": {"note.txt": true}})"), &one));
        EXPECT_EQ(Parse(R"({"note.txt": )" + tessel::toString(ReadJson(InfoPath(strId, "note.txt"))) + "}"),
                  one.get_metabinary_info());
    }

    // A copy from another object brings the source's description along and
    // makes digest, name and time its own.
    Json::Value jSrcInfo = ReadJson(InfoPath(strId, "photo.png"));
    jSrcInfo["filename"] = "Holiday.png";
    ASSERT_TRUE(tessel::toFile(jSrcInfo, InfoPath(strId, "photo.png")));
    ASSERT_TRUE(Save(strOther, Parse(R"([{"name": "photo.png", "format": "object", "id": ")" + strId + "\"}]")))
        << ::testing::PrintToString(ErrMsgs());
    EXPECT_EQ(ReadFile(DataPath(strId, "photo.png")), ReadFile(DataPath(strOther, "photo.png")));
    Json::Value jCopyInfo = ReadJson(InfoPath(strOther, "photo.png"));
    EXPECT_LE(saved, jCopyInfo["auto_mtime"].asInt64());
    jSrcInfo["auto_mtime"] = jCopyInfo["auto_mtime"];
    EXPECT_EQ(jSrcInfo, jCopyInfo);

    // A file stored by a newer request than this one stays; one stored by
    // an older request is replaced or removed.
    Json::Value jNote = ReadJson(InfoPath(strId, "note.txt"));
    jNote["auto_mtime"] = (Json::Int64)time(NULL) + 1000;
    ASSERT_TRUE(tessel::toFile(jNote, InfoPath(strId, "note.txt")));
    ASSERT_TRUE(Save(strId, Items({Upload("note.txt", "raw", "older")})));
    EXPECT_EQ("hello", ReadFile(DataPath(strId, "note.txt")));
    ASSERT_TRUE(Save(strId, Parse(R"([{"name": "note.txt", "format": "delete"}])")));
    EXPECT_EQ(jNote, ReadJson(InfoPath(strId, "note.txt")));
    jNote["auto_mtime"] = 1;
    ASSERT_TRUE(tessel::toFile(jNote, InfoPath(strId, "note.txt")));
    ASSERT_TRUE(Save(strId, Items({Upload("note.txt", "raw", "newer")})));
    EXPECT_EQ("newer", ReadFile(DataPath(strId, "note.txt")));
    EXPECT_LE(saved, ReadJson(InfoPath(strId, "note.txt"))["auto_mtime"].asInt64());
    ASSERT_TRUE(Save(strId, Parse(R"([{"name": "note.txt", "format": "delete"},
                                          {"name": "never.txt", "format": "delete"}])")));
    EXPECT_FALSE(fs::exists(DataPath(strId, "note.txt")));
    EXPECT_FALSE(fs::exists(InfoPath(strId, "note.txt")));
    EXPECT_EQ(Msgs{Encoded("photo.png")}, Entries(kNsDir + "/" + strId + "/metabinary_info"));
}

TEST_F(MetaBinary, BadItemsAreRefusedWithTheirCondition) {
    const std::string strId = Create();
    const Msgs tail = {"!mf_SaveMetaBinary()", "!mf_SaveConfig(strNewVer)"};
    struct Case {
        std::string files;
        int code;
        Msgs msgs;
    };
    const std::vector<Case> cases = {
        {R"({"format": "raw", "path": "/tmp/x"})", TESSEL_ERR_BAD_PARAMETERS, {"!jArray[i].isMember(\"name\")"}},
        {R"({"name": "a", "path": "/tmp/x"})", TESSEL_ERR_BAD_PARAMETERS, {"!jArray[i].isMember(\"format\")"}},
        {R"({"name": "a", "format": "raw"})", TESSEL_ERR_BAD_PARAMETERS, {"!jArray[i].isMember(\"path\")"}},
        {R"({"name": "a", "format": "base64", "path": "/tmp/no-such-upload"})", TESSEL_ERR_OPEN_FILE,
         {"NULL == fopen(strFile.c_str(), \"rb\")", "!FsReadWholeFile(strFileTmp, strText)", "!DecodeBase64File(jArray[i][\"path\"].asString(), strDecoded)"}},
        {R"({"name": "a", "format": "raw", "path": "/tmp/no-such-upload"})", TESSEL_ERR_COPY_FILE,
         {"0 > QUORFileCopy(strSrc.c_str(), strDest.c_str(), &copyArg)", "!mf_CopyFile(strFileTmp, strFileNew)"}},
        {R"({"name": "a", "format": "object"})", TESSEL_ERR_BAD_PARAMETERS,
         {"!jItem.isMember(\"id\")", "!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp)"}},
        {R"({"name": "a", "format": "object", "id": ")" + strId + "\"}", TESSEL_ERR_UNEXPECTED,
         {"!QLIBCFileExist(strFileSrc.c_str())"}},
        {R"({"name": "a", "format": "object", "id": "../x"})", TESSEL_ERR_USER_INPUT,
         {"Bad ID [../x]", "UID_ERR == (owner = TesselObjectGetOwnerByID(jItem[\"id\"].asString()))",
          "!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp)"}},
    };
    for (const Case &c : cases) {
        EXPECT_FALSE(Save(strId, Parse("[" + c.files + "]"))) << c.files;
        EXPECT_EQ(c.code, ErrCode()) << c.files;
        Msgs msgs = c.msgs;
        msgs.insert(msgs.end(), tail.begin(), tail.end());
        EXPECT_EQ(msgs, ErrMsgs()) << c.files;
    }
    // Bad base64 content: refused, and the decoded scratch copy is gone.
    EXPECT_FALSE(Save(strId, Items({Upload("a", "base64", "not*base64")})));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(Msgs({"!QLIBCBase64Decode(strText.c_str(), strText.size(), &strData[0], &nDecoded)",
                    "!DecodeBase64File(jArray[i][\"path\"].asString(), strDecoded)", tail[0], tail[1]}),
              ErrMsgs());
    EXPECT_EQ(Msgs{}, Entries("/volume1/@tmp/@Tessel/ledger"));

    // An unknown format is logged and passed over; the other items are saved.
    const size_t mark = SyslogMark();
    Json::Value jFiles = Parse(R"([{"name": "z", "format": "zip"}])");
    jFiles.append(Upload("kept", "raw", "k"));
    ASSERT_TRUE(Save(strId, jFiles)) << ::testing::PrintToString(ErrMsgs());
    auto line = WaitForSyslog(R"(bad binary file format, json={"format":"zip","name":"z"})", mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(0u, line->message.find("backend_fs/meta:"));
    EXPECT_EQ(Msgs{Encoded("kept")}, Entries(kNsDir + "/" + strId + "/metabinary"));
    EXPECT_EQ(Msgs{Encoded("kept")}, Entries(kNsDir + "/" + strId + "/metabinary_info"));
}

TEST_F(MetaBinary, DownloadWritesTheGatewayResponse) {
    const std::string strId = Create();
    ASSERT_TRUE(Save(strId, Items({Upload("four.txt", "raw", "abcd"), Upload("résumé 1.txt", "raw", "cv"),
                                   Upload("empty.bin", "raw", "")}))) << ::testing::PrintToString(ErrMsgs());
    const std::string strMd5 = Md5Of(DataPath(strId, "four.txt"));
    auto req = [&](const std::string &strField, const std::string &strFormat, const std::string &strMore = "") {
        Json::Value jParm = Req(strId, R"("segment": "metabinary", "requester": 1001)" + strMore);
        jParm["field"] = strField;
        jParm["format"] = strFormat;
        return jParm;
    };

    // Base64: a Content-Length one more than the text, the digest as tag,
    // an expiry of now.
    const time_t before = time(NULL);
    Response resp = Download(req("four.txt", "base64", R"(, "mode": "download", "headers": {"X-Tag": "t1"})"));
    const time_t after = time(NULL);
    ASSERT_TRUE(resp.ok) << tessel::toString(resp.stack);
    const size_t posExpires = resp.out.find("Expires:");
    ASSERT_NE(std::string::npos, posExpires);
    const size_t posEnd = resp.out.find("\r\n", posExpires);
    const std::string strExpires = resp.out.substr(posExpires + 8, posEnd - posExpires - 8);
    EXPECT_EQ("Content-Type:text/plain\r\n"
              "Content-Disposition:attachment; filename=\"four.txt\"\r\n"
              "Content-Length: 9\r\n"
              "ETag:" + strMd5 + "\r\n"
              "Expires:" + strExpires + "\r\n"
              "X-Tag: t1\r\n"
              "\r\n"
              "YWJjZA==",
              resp.out);
    struct tm tmExpires = {};
    ASSERT_NE(nullptr, strptime(strExpires.c_str(), "%a, %d %b %Y %T GMT", &tmExpires)) << strExpires;
    EXPECT_LE(before, timegm(&tmExpires));
    EXPECT_GE(after, timegm(&tmExpires));

    // Raw: the attachment and extra headers, then the file output's own. A
    // client whose copy is current gets 304 and nothing else, whatever the
    // format. The attachment name is URL-encoded for the older browsers only.
    const std::string strCv = "Content-Type: text/plain\r\nContent-Length: 2\r\n\r\ncv";
    const std::vector<std::tuple<Json::Value, std::map<std::string, std::string>, std::string>> served = {
        {req("four.txt", "raw"), {}, "Content-Type: text/plain\r\nContent-Length: 4\r\n\r\nabcd"},
        {req("four.txt", "zip"), {{"HTTP_IF_NONE_MATCH", strMd5}}, "Status: 304 Not Modified\r\n\r\n"},
        {req("résumé 1.txt", "raw", R"(, "mode": "download")"),
         {{"HTTP_USER_AGENT", "Mozilla/5.0 (Windows NT 10.0; Trident/7.0; rv:11.0) like Gecko"}},
         "Content-Disposition:attachment; filename=\"r%C3%A9sum%C3%A9%201.txt\"\r\n" + strCv},
        {req("résumé 1.txt", "raw", R"(, "mode": "download")"),
         {{"HTTP_USER_AGENT", "Mozilla/5.0 (X11; Linux) Firefox/120"}},
         "Content-Disposition:attachment; filename=\"résumé 1.txt\"\r\n" + strCv},
    };
    for (const auto &c : served) {
        resp = Download(std::get<0>(c), std::get<1>(c));
        EXPECT_TRUE(resp.ok) << tessel::toString(resp.stack);
        EXPECT_EQ(std::get<2>(c), resp.out);
    }

    // Failures: nothing printed, the condition on the stack, the log line.
    const Msgs tail = {"!mf_DownloadBinaryByDir(strBinaryDir, strBinaryInfoDir)", "!mf_DownloadMetaBinary()"};
    size_t mark = SyslogMark();
    Json::Value jParm = req("four.txt", "zip");
    resp = Download(jParm);
    EXPECT_FALSE(resp.ok);
    EXPECT_EQ("", resp.out);
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, resp.stack[0]["code"].asInt());
    const std::string strWrong = "wrong foramt, jParm=" + tessel::toString(
        [&] { Json::Value j = jParm; j["owner"] = 1001; return j; }());
    EXPECT_EQ((Msgs{strWrong, tail[0], tail[1]}), FrameMsgs(resp.stack));
    auto line = WaitForSyslog(strWrong, mark, LOG_USER | LOG_ERR);
    ASSERT_TRUE(line.has_value());
    EXPECT_EQ(0u, line->message.find("backend_fs/utils:"));

    const std::string openPrint = "!OpenBinaryAndPrint(blBase64, strBinaryFilePath, strFileName, strEtag, "
                                  "blAttachment, m_jParm[\"headers\"])";
    Json::Value jNoField = req("four.txt", "raw");
    jNoField.removeMember("field");
    Json::Value jNoSegment = req("four.txt", "raw");
    jNoSegment.removeMember("segment");
    const std::vector<std::tuple<Json::Value, int, Msgs>> failures = {
        {req("empty.bin", "base64"), TESSEL_ERR_READ_FILE, {"size == 0", openPrint, tail[0], tail[1]}},
        {req("gone.txt", "raw"), TESSEL_ERR_UNEXPECTED, {"!QLIBCFileExist(strBinaryFilePath.c_str())", tail[0], tail[1]}},
        {req("four.txt", "raw", R"(, "headers": {"X-Bad": "a\r\nSet-Cookie: x"})"), TESSEL_ERR_BAD_PARAMETERS,
         {"bad header [X-Bad]", openPrint, tail[0], tail[1]}},
        {jNoField, TESSEL_ERR_BAD_PARAMETERS, {"!m_jParm.isMember(\"field\")", tail[0], tail[1]}},
        {jNoSegment, TESSEL_ERR_BAD_PARAMETERS, {"!jParm.isMember(\"segment\")"}},
    };
    for (const auto &f : failures) {
        resp = Download(std::get<0>(f));
        EXPECT_FALSE(resp.ok) << std::get<2>(f)[0];
        EXPECT_EQ("", resp.out) << std::get<2>(f)[0];
        EXPECT_EQ(std::get<1>(f), resp.stack[0]["code"].asInt()) << std::get<2>(f)[0];
        EXPECT_EQ(std::get<2>(f), FrameMsgs(resp.stack));
    }

    mark = SyslogMark();
    jParm = req("four.txt", "raw");
    jParm["segment"] = "thumbnail";
    resp = Download(jParm);
    EXPECT_FALSE(resp.ok);
    EXPECT_EQ(TESSEL_ERR_BAD_PARAMETERS, resp.stack[0]["code"].asInt());
    ASSERT_TRUE(WaitForSyslog("segment error, jParm=" + tessel::toString(jParm), mark, LOG_USER | LOG_ERR));
}

// The web handlers' entry: the request from a string hash, checked before
// anything is read.
TEST(ObjectDownload, RequestsAreCheckedBeforeAnyRead) {
    std::unique_ptr<QLIBSZHASH, void (*)(QLIBSZHASH *)> hash(QLIBCSzHashAlloc(16), QLIBCSzHashFree);
    ASSERT_TRUE(hash);
    const std::vector<std::pair<const char *, const char *>> keys = {
        {"ns", "ledger"}, {"id", "1001_X"}, {"segment", "metabinary"}, {"field", "a"}, {"format", "raw"},
        {"requester", "1001"}};
    for (const auto &kv : keys) {
        ErrClear();
        EXPECT_FALSE(TesselObjectDownload(hash.get()));
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
        EXPECT_EQ(Msgs{std::string("NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"") + kv.first + "\"))"},
                  ErrMsgs());
        ASSERT_LE(0, QLIBCSzHashSetValue(hash.get(), kv.first, kv.second));
    }
    const std::vector<std::pair<const char *, const char *>> badRequesters = {
        {"", "!isdigit(pParm[0])"}, {"-1", "!isdigit(pParm[0])"}, {" 1", "!isdigit(pParm[0])"},
        {"1001x", "endPtr && *endPtr"}, {"4294967296", "requester > UID_ERR"}};
    for (const auto &bad : badRequesters) {
        ASSERT_LE(0, QLIBCSzHashSetValue(hash.get(), "requester", bad.first));
        ErrClear();
        EXPECT_FALSE(TesselObjectDownload(hash.get())) << bad.first;
        EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode()) << bad.first;
        EXPECT_EQ(Msgs{bad.second}, ErrMsgs()) << bad.first;
    }

    TESSEL_OBJECT object;
    ErrClear();
    EXPECT_FALSE(object.Download(Parse(R"({"ns": "ledger", "id": "1001_X", "segment": 7, "requester": 1001})")));
    EXPECT_EQ(TESSEL_ERR_USER_INPUT, ErrCode());
    EXPECT_EQ(Msgs{"!jParm[\"ns\"].isString() || !jParm[\"id\"].isString() || !jParm[\"segment\"].isString()"},
              ErrMsgs());
}

}  // namespace
