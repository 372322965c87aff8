/*
 * The bad-argument report of the plain-function accessors (and of fromJson):
 * one log line "<module>:<line> Invaild Argument (<condition>)=[<value>]" at
 * LOG_ERR, then the platform's error state QLIBC_ERR_BAD_PARAMETERS (0xD00).
 * Applications that use these functions read QLIBCErrGet(), so the library's
 * own error stack is left alone.
 */
#ifndef TESSEL_OBJECT_OBJECT_ITEM_H
#define TESSEL_OBJECT_OBJECT_ITEM_H

namespace tessel {

/* Reports and returns -1. */
int ReportBadArgument(const char *szModule, int line, const char *szCondition, int value);

}  // namespace tessel

/* When ok does not hold: report (condition text, offending value) and return -1. */
#define TESSEL_ITEM_CHECK(module, ok, text, value)                                   \
    do {                                                                             \
        if (!(ok)) {                                                                 \
            return ::tessel::ReportBadArgument((module), __LINE__, (text), (value)); \
        }                                                                            \
    } while (0)

#endif /* TESSEL_OBJECT_OBJECT_ITEM_H */
