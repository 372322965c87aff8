/*
 * The database wrapper of the platform, over libpq.
 */
#ifndef QUOR_QUOR_DB_H
#define QUOR_QUOR_DB_H

#include "qlib.h"

#ifdef __cplusplus
extern "C" {
#endif

typedef struct DBConnect_tag DBConnect_tag;
typedef struct DBResult_tag DBResult_tag;

/* Database flavours of QUORDBEscapeStringEX3. */
#define QUOR_DB_PGSQL 1

/*
 * Connects to database szDB as szUser. A NULL host means the default local
 * socket; NULL arguments fall back to libpq's standard environment (PGHOST,
 * PGPORT, PGUSER, ...) and defaults. Every session (also one reopened after
 * the server dropped it) uses client encoding UTF8 and
 * standard_conforming_strings on, which QUORDBEscapeStringEX3 relies on.
 * Returns the connection, or NULL (the reason goes to the system log).
 */
QUOR_EXPORT DBConnect_tag *QUORDBConnect(const char *szHost, const char *szUser, const char *szPassword,
                                         const char *szDB);
QUOR_EXPORT void QUORDBClose(DBConnect_tag *pConn);

/*
 * Runs one or more ';'-separated statements. On success returns 0 and, when
 * ppResult is not NULL, the result of the last statement in *ppResult (free
 * with QUORDBFreeResult). On failure returns -1 (the server's message goes to
 * the system log) and sets *ppResult to NULL.
 */
QUOR_EXPORT int QUORDBExecute(DBConnect_tag *pConn, const char *szSQL, DBResult_tag **ppResult);
QUOR_EXPORT int QUORDBNumRows(const DBResult_tag *pResult);
/* The text of a field by row and column name; NULL when out of range or NULL in SQL. */
QUOR_EXPORT const char *QUORDBFetchField(const DBResult_tag *pResult, int row, const char *szColumn);
QUOR_EXPORT void QUORDBFreeResult(DBResult_tag *pResult);

/*
 * Fills the markers of szTemplate in order from the arguments that follow:
 *   "@QUOR:VAR"   const char *       the text escaped for a quoted SQL literal
 *                                     (the template supplies the quotes): each
 *                                     quote doubled, backslashes kept as they
 *                                     are (standard strings)
 *   "@QUOR:LLINT" long long          decimal
 *   "@QUOR:INT"   int                decimal
 * Markers match exactly: "@QUOR:VAR_info" is "@QUOR:VAR" followed by "_info";
 * filled text is not searched for markers again.
 * Returns a malloc()ed statement (free with free()), or NULL when a text is
 * NULL or not valid UTF-8 (overlong forms and surrogates included) or memory
 * runs out.
 */
QUOR_EXPORT char *QUORDBEscapeStringEX3(int dbType, const char *szTemplate, ...);

#ifdef __cplusplus
}
#endif

#endif /* QUOR_QUOR_DB_H */
