// jsoncpp glue; see tessel_json.h.
#include "common/tessel_json.h"

#include <fstream>
#include <memory>
#include <sstream>

#include <json/reader.h>
#include <json/writer.h>

namespace tessel {

namespace {

const Json::StreamWriterBuilder &CompactWriter() {
    static const Json::StreamWriterBuilder builder = [] {
        Json::StreamWriterBuilder b;
        b["indentation"] = "";
        b["emitUTF8"] = true;
        return b;
    }();
    return builder;
}

const Json::CharReaderBuilder &Reader() {
    static const Json::CharReaderBuilder builder;
    return builder;
}

}  // namespace

bool fromString(Json::Value &jOut, const std::string &strText) {
    std::unique_ptr<Json::CharReader> reader(Reader().newCharReader());
    std::string strErrs;
    Json::Value jParsed;
    if (!reader->parse(strText.data(), strText.data() + strText.size(), &jParsed, &strErrs)) {
        jOut = Json::Value();
        return false;
    }
    jOut.swap(jParsed);
    return true;
}

bool fromFile(Json::Value &jOut, const std::string &strPath) {
    std::ifstream ifs(strPath, std::ios::in | std::ios::binary);
    if (!ifs.is_open()) {
        return false;
    }
    std::ostringstream oss;
    oss << ifs.rdbuf();
    if (ifs.bad()) {
        return false;
    }
    return fromString(jOut, oss.str());
}

std::string toString(const Json::Value &jVal) { return Json::writeString(CompactWriter(), jVal); }

bool toFile(const Json::Value &jVal, const std::string &strPath) {
    std::ofstream ofs(strPath, std::ios::out | std::ios::trunc | std::ios::binary);
    if (!ofs.is_open()) {
        return false;
    }
    ofs << toString(jVal);
    ofs.flush();
    return ofs.good();
}

}  // namespace tessel
