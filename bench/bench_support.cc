#include "bench/bench_support.h"

#include <stdio.h>

#include <filesystem>
#include <memory>
#include <system_error>

#include <json/reader.h>
#include <json/writer.h>

namespace tessel_bench {

Json::Value Parse(const std::string &strText) {
    Json::CharReaderBuilder builder;
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    Json::Value jVal;
    reader->parse(strText.data(), strText.data() + strText.size(), &jVal, nullptr);
    return jVal;
}

std::string Compact(const Json::Value &jVal, bool blUtf8) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    if (blUtf8) {
        builder["emitUTF8"] = true;
    }
    return Json::writeString(builder, jVal);
}

bool PlaceBenchNamespace() {
    namespace fs = std::filesystem;
    FILE *pConf = fopen("/usr/quor/etc/tessel.conf", "w");
    if (nullptr == pConf) {
        return false;
    }
    fputs(R"({"Access":{"enable":true,"enable_ns_bench":true}})", pConf);
    fclose(pConf);
    std::error_code ec;
    fs::create_directories("/volume1/@Tessel/bench", ec);
    fs::create_directories("/usr/quor/etc/tessel/ns", ec);
    fs::create_directory_symlink("/volume1/@Tessel/bench", "/usr/quor/etc/tessel/ns/bench", ec);
    return true;
}

bool WriteWhole(const std::string &strPath, const std::string &strData) {
    FILE *f = fopen(strPath.c_str(), "wb");
    if (f == nullptr) {
        return false;
    }
    const bool ok = fwrite(strData.data(), 1, strData.size(), f) == strData.size();
    return fclose(f) == 0 && ok;
}

}  // namespace tessel_bench
