/*
 * The one way this library reports a failure: a system-log line
 * "<module>:<line> Failed [<condition>], err=%m" at LOG_ERR, then a frame on
 * the calling thread's error stack. A failure that starts here sets a new
 * error with its code (TESSEL_RAISE); a failure passed up from a callee that
 * already reported appends a frame (TESSEL_APPEND).
 *
 * Every source file names its module once, before the first use:
 *
 *     static constexpr const char kTesselModule[] = "common/tessel_conf";
 *
 * and writes each check as one line, with the condition text as the message:
 *
 *     TESSEL_CHECK(!jConf.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf.isObject()", false);
 *     TESSEL_CHECK_APPEND(!ReadConfFile(jConf), "!ReadConfFile(jConf)", false);
 *
 * Messages are printf formats (plain condition texts contain no '%'). errno
 * is left as it was, so "%m" in the log line shows the cause.
 */
#ifndef TESSEL_COMMON_TESSEL_REPORT_H
#define TESSEL_COMMON_TESSEL_REPORT_H

#include <syslog.h>

#include "tessel_error.h"

namespace tessel {

void ReportSet(const char *szModule, int line, int code, const char *szFormat, ...)
    __attribute__((format(printf, 4, 5)));
void ReportAppend(const char *szModule, int line, const char *szFormat, ...)
    __attribute__((format(printf, 3, 4)));
/* The log line alone, for failures that are logged but not returned. */
void ReportLog(const char *szModule, int line, const char *szFormat, ...)
    __attribute__((format(printf, 3, 4)));
/* A free-form log line "<module>:<line> <text>" at the given priority. */
void LogLine(int priority, const char *szModule, int line, const char *szFormat, ...)
    __attribute__((format(printf, 4, 5)));

}  // namespace tessel

#define TESSEL_RAISE(code, ...) ::tessel::ReportSet(kTesselModule, __LINE__, (code), __VA_ARGS__)
#define TESSEL_APPEND(...) ::tessel::ReportAppend(kTesselModule, __LINE__, __VA_ARGS__)
#define TESSEL_LOG_FAILED(...) ::tessel::ReportLog(kTesselModule, __LINE__, __VA_ARGS__)
/* syslog(priority, "<module>:<line> " fmt, ...) */
#define TESSEL_LOG(priority, ...) ::tessel::LogLine((priority), kTesselModule, __LINE__, __VA_ARGS__)

/* When cond holds: report a new error (code, text) and return the trailing argument(s). */
#define TESSEL_CHECK(cond, code, text, ...) \
    do {                                    \
        if (cond) {                         \
            TESSEL_RAISE((code), text);     \
            return __VA_ARGS__;             \
        }                                   \
    } while (0)

/* When cond holds: append a frame (text) and return the trailing argument(s). */
#define TESSEL_CHECK_APPEND(cond, text, ...) \
    do {                                     \
        if (cond) {                          \
            TESSEL_APPEND(text);             \
            return __VA_ARGS__;              \
        }                                    \
    } while (0)

#endif /* TESSEL_COMMON_TESSEL_REPORT_H */
