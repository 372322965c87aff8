// The database wrapper over libpq.
//
// Statements are built as text by QUORDBEscapeStringEX3, which has no
// connection to ask how the server reads string literals. Every connection
// this wrapper makes is therefore put into the one state the escaping relies
// on: client encoding UTF8 and standard_conforming_strings on, so that inside
// '...' only the quote is special and a backslash is an ordinary character.
#include <limits.h>
#include <stdarg.h>
#include <stdlib.h>
#include <string.h>
#include <syslog.h>

#include <new>
#include <string>

#include <libpq-fe.h>

#include "quor/quor_db.h"

struct DBConnect_tag {
    PGconn *pConn;
};

struct DBResult_tag {
    PGresult *pRes;
};

namespace {

constexpr char kMarkerVar[] = "@QUOR:VAR";
constexpr char kMarkerLLInt[] = "@QUOR:LLINT";
constexpr char kMarkerInt[] = "@QUOR:INT";

// libpq messages end in a newline and may span lines (DETAIL, LINE, ...);
// one log line each keeps them readable and greppable.
std::string OneLine(const char *szText) {
    std::string text = (NULL == szText) ? "" : szText;
    while (!text.empty() && ('\n' == text.back() || ' ' == text.back())) {
        text.pop_back();
    }
    for (char &c : text) {
        if ('\n' == c || '\r' == c || '\t' == c) {
            c = ' ';
        }
    }
    return text;
}

void LogConnError(PGconn *pConn, int line) {
    syslog(LOG_ERR, "%s:%d database connection failed: %s", __FILE__, line, OneLine(PQerrorMessage(pConn)).c_str());
}

void LogResultError(PGconn *pConn, const PGresult *pRes, int line) {
    const char *szState = (NULL == pRes) ? NULL : PQresultErrorField(pRes, PG_DIAG_SQLSTATE);
    const char *szMessage = (NULL == pRes) ? NULL : PQresultErrorMessage(pRes);
    if (NULL == szMessage || '\0' == szMessage[0]) {
        szMessage = PQerrorMessage(pConn);
    }
    syslog(LOG_ERR, "%s:%d database statement failed [%s]: %s", __FILE__, line, (NULL == szState) ? "-" : szState,
           OneLine(szMessage).c_str());
}

// Brings a fresh (or reset) session into the state the escaping relies on.
bool PrepareSession(PGconn *pConn) {
    const char *szScs = PQparameterStatus(pConn, "standard_conforming_strings");
    if (NULL != szScs && 0 == strcmp(szScs, "on")) {
        return true;
    }
    PGresult *pRes = PQexec(pConn, "SET standard_conforming_strings = on");
    bool ok = (PGRES_COMMAND_OK == PQresultStatus(pRes));
    if (!ok) {
        LogResultError(pConn, pRes, __LINE__);
    }
    PQclear(pRes);
    return ok;
}

// A COPY started by a statement would leave the connection unusable for the
// next one; end it and swallow what the server sends.
void AbandonCopy(PGconn *pConn, ExecStatusType status) {
    if (PGRES_COPY_IN == status) {
        PQputCopyEnd(pConn, "COPY FROM STDIN is not supported by this interface");
    } else if (PGRES_COPY_OUT == status) {
        char *pBuf = NULL;
        while (PQgetCopyData(pConn, &pBuf, 0) > 0) {
            PQfreemem(pBuf);
            pBuf = NULL;
        }
    }
    for (PGresult *pRes = PQgetResult(pConn); NULL != pRes; pRes = PQgetResult(pConn)) {
        PQclear(pRes);
    }
}

// Strict UTF-8: no overlong forms, no surrogates, nothing above U+10FFFF.
bool IsValidUtf8(const unsigned char *p) {
    while ('\0' != *p) {
        unsigned char c = *p;
        int nCont = 0;
        unsigned char lo = 0x80;
        unsigned char hi = 0xBF;
        if (c < 0x80) {
            ++p;
            continue;
        } else if (c >= 0xC2 && c <= 0xDF) {
            nCont = 1;
        } else if (c >= 0xE0 && c <= 0xEF) {
            nCont = 2;
            lo = (0xE0 == c) ? 0xA0 : 0x80;
            hi = (0xED == c) ? 0x9F : 0xBF;
        } else if (c >= 0xF0 && c <= 0xF4) {
            nCont = 3;
            lo = (0xF0 == c) ? 0x90 : 0x80;
            hi = (0xF4 == c) ? 0x8F : 0xBF;
        } else {
            return false;
        }
        ++p;
        for (int i = 0; i < nCont; ++i, ++p) {
            unsigned char min = (0 == i) ? lo : 0x80;
            unsigned char max = (0 == i) ? hi : 0xBF;
            if (*p < min || *p > max) {
                return false;  // also stops at a terminating NUL
            }
        }
    }
    return true;
}

bool StartsWith(const char *p, const char *szMarker, size_t cch) { return 0 == strncmp(p, szMarker, cch); }

// Fills the template; false (error state set) when a text is refused.
bool FillTemplate(const char *szTemplate, va_list args, std::string *pOut) {
    const size_t cchVar = sizeof(kMarkerVar) - 1;
    const size_t cchLLInt = sizeof(kMarkerLLInt) - 1;
    const size_t cchInt = sizeof(kMarkerInt) - 1;
    for (const char *p = szTemplate; '\0' != *p;) {
        if ('@' != *p) {
            const char *at = strchr(p, '@');
            size_t n = (NULL == at) ? strlen(p) : static_cast<size_t>(at - p);
            pOut->append(p, n);
            p += n;
        } else if (StartsWith(p, kMarkerVar, cchVar)) {
            const char *szText = va_arg(args, const char *);
            if (NULL == szText || !IsValidUtf8(reinterpret_cast<const unsigned char *>(szText))) {
                QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
                return false;
            }
            for (const char *s = szText; '\0' != *s; ++s) {
                if ('\'' == *s) {
                    pOut->push_back('\'');
                }
                pOut->push_back(*s);
            }
            p += cchVar;
        } else if (StartsWith(p, kMarkerLLInt, cchLLInt)) {
            pOut->append(std::to_string(va_arg(args, long long)));
            p += cchLLInt;
        } else if (StartsWith(p, kMarkerInt, cchInt)) {
            pOut->append(std::to_string(va_arg(args, int)));
            p += cchInt;
        } else {
            pOut->push_back(*p++);
        }
    }
    return true;
}

}  // namespace

extern "C" {

DBConnect_tag *QUORDBConnect(const char *szHost, const char *szUser, const char *szPassword, const char *szDB) {
    // Only the arguments given are passed, so libpq fills the rest from its
    // environment (PGHOST, PGUSER, ...) and defaults; no host means the
    // default local socket.
    const char *rgszKey[6];
    const char *rgszValue[6];
    int n = 0;
    const struct {
        const char *szKey;
        const char *szValue;
    } given[] = {{"host", szHost}, {"user", szUser}, {"password", szPassword}, {"dbname", szDB}};
    for (const auto &one : given) {
        if (NULL != one.szValue) {
            rgszKey[n] = one.szKey;
            rgszValue[n] = one.szValue;
            ++n;
        }
    }
    rgszKey[n] = "client_encoding";
    rgszValue[n] = "UTF8";
    ++n;
    rgszKey[n] = NULL;
    rgszValue[n] = NULL;

    PGconn *pConn = PQconnectdbParams(rgszKey, rgszValue, 0);
    if (NULL == pConn) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return NULL;
    }
    if (CONNECTION_OK != PQstatus(pConn)) {
        LogConnError(pConn, __LINE__);
        PQfinish(pConn);
        QLIBCErrSetEx(QLIBC_ERR_DB, __FILE__, __LINE__);
        return NULL;
    }
    if (!PrepareSession(pConn)) {
        PQfinish(pConn);
        QLIBCErrSetEx(QLIBC_ERR_DB, __FILE__, __LINE__);
        return NULL;
    }
    DBConnect_tag *pDB = new (std::nothrow) DBConnect_tag;
    if (NULL == pDB) {
        PQfinish(pConn);
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return NULL;
    }
    pDB->pConn = pConn;
    return pDB;
}

void QUORDBClose(DBConnect_tag *pConn) {
    if (NULL == pConn) {
        return;
    }
    PQfinish(pConn->pConn);
    delete pConn;
}

int QUORDBExecute(DBConnect_tag *pConn, const char *szSQL, DBResult_tag **ppResult) {
    if (NULL != ppResult) {
        *ppResult = NULL;
    }
    if (NULL == pConn || NULL == szSQL) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        // A connection the server dropped (restart, terminated backend) is
        // reopened before the statement is sent; a statement that was already
        // sent is never repeated, as it may have run.
        if (CONNECTION_OK != PQstatus(pConn->pConn)) {
            PQreset(pConn->pConn);
            if (CONNECTION_OK != PQstatus(pConn->pConn) || !PrepareSession(pConn->pConn)) {
                LogConnError(pConn->pConn, __LINE__);
                QLIBCErrSetEx(QLIBC_ERR_DB, __FILE__, __LINE__);
                return -1;
            }
        }
        PGresult *pRes = PQexec(pConn->pConn, szSQL);
        ExecStatusType status = PQresultStatus(pRes);
        if (PGRES_COMMAND_OK != status && PGRES_TUPLES_OK != status && PGRES_EMPTY_QUERY != status) {
            LogResultError(pConn->pConn, pRes, __LINE__);
            PQclear(pRes);
            AbandonCopy(pConn->pConn, status);
            QLIBCErrSetEx(QLIBC_ERR_DB, __FILE__, __LINE__);
            return -1;
        }
        if (NULL == ppResult) {
            PQclear(pRes);
            return 0;
        }
        DBResult_tag *pResult = new (std::nothrow) DBResult_tag;
        if (NULL == pResult) {
            PQclear(pRes);
            QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
            return -1;
        }
        pResult->pRes = pRes;
        *ppResult = pResult;
        return 0;
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

int QUORDBNumRows(const DBResult_tag *pResult) {
    if (NULL == pResult) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    return PQntuples(pResult->pRes);
}

const char *QUORDBFetchField(const DBResult_tag *pResult, int row, const char *szColumn) {
    if (NULL == pResult || NULL == szColumn || row < 0 || row >= PQntuples(pResult->pRes)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return NULL;
    }
    // Exact names: PQfnumber would fold unquoted names to lower case.
    int nFields = PQnfields(pResult->pRes);
    for (int col = 0; col < nFields; ++col) {
        const char *szName = PQfname(pResult->pRes, col);
        if (NULL != szName && 0 == strcmp(szName, szColumn)) {
            if (PQgetisnull(pResult->pRes, row, col)) {
                return NULL;
            }
            return PQgetvalue(pResult->pRes, row, col);
        }
    }
    QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
    return NULL;
}

void QUORDBFreeResult(DBResult_tag *pResult) {
    if (NULL == pResult) {
        return;
    }
    PQclear(pResult->pRes);
    delete pResult;
}

char *QUORDBEscapeStringEX3(int dbType, const char *szTemplate, ...) {
    if (QUOR_DB_PGSQL != dbType || NULL == szTemplate) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return NULL;
    }
    va_list args;
    va_start(args, szTemplate);
    bool ok = false;
    std::string out;
    try {
        ok = FillTemplate(szTemplate, args, &out);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
    }
    va_end(args);
    if (!ok) {
        return NULL;
    }
    char *szSQL = static_cast<char *>(malloc(out.size() + 1));
    if (NULL == szSQL) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return NULL;
    }
    memcpy(szSQL, out.c_str(), out.size() + 1);
    return szSQL;
}

}  // extern "C"
