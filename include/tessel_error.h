/*
 * Error reporting: the code table and the per-thread error stack.
 *
 * A failing call leaves on the calling thread's stack a frame for the root
 * cause (frame 0, with "code") and one frame per place the failure passed on
 * its way up. The stack is never cleared on success: read it only after a
 * call has reported failure.
 */
#ifndef TESSEL_ERROR_H
#define TESSEL_ERROR_H

#include <stdio.h>

#ifdef __cplusplus
#include <json/value.h>
#endif

#include "tessel_export.h"

/* Error codes. Applications compare against these numbers; they never change. */
enum {
    TESSEL_ERR_LOCK_VOLUME = 900,          /* the namespace's volume-move lock was not obtained */
    TESSEL_ERR_LOCK_BACKUP = 901,          /* the namespace's backup lock was not obtained */
    TESSEL_ERR_LOCK_OBJECT = 902,          /* an object lock was not obtained */
    TESSEL_ERR_OPERATION_FAILED = 1000,    /* "Operation failed." */
    TESSEL_ERR_LOCK_FAILED = 1001,         /* "Lock failed." */
    TESSEL_ERR_OPEN_FILE = 1002,           /* "Open File failed." */
    TESSEL_ERR_READ_FILE = 1003,           /* "Read file/data failed." */
    TESSEL_ERR_CREATE_DB_DATA = 1004,      /* "Create DB data failed." */
    TESSEL_ERR_WRITE_DB_DATA = 1005,       /* "Write DB data failed." */
    TESSEL_ERR_DELETE_DB_DATA = 1006,      /* "Delete DB data failed." */
    TESSEL_ERR_USER_INPUT = 1007,          /* "User input error." */
    TESSEL_ERR_NOT_EXISTS = 1008,          /* "Object not exists." */
    TESSEL_ERR_DEMO_MODE = 1009,           /* "Operation is unavailable in demo mode." */
    TESSEL_ERR_NO_BACKEND = 1010,          /* "No such backend." */
    TESSEL_ERR_USER_HOME_DISABLED = 1011,  /* "User home is disabled." */
    TESSEL_ERR_NS_DISABLED = 1012,         /* "Namespace is disabled." */
    TESSEL_ERR_NO_HOOK_TABLE = 1013,       /* "No function table in namespace module." */
    TESSEL_ERR_OUT_OF_MEMORY = 1014,       /* "Allocate memory failed." */
    TESSEL_ERR_BAD_PARAMETERS = 1015,      /* "Bad use by passing parameters." */
    TESSEL_ERR_UNEXPECTED = 1016,          /* "Should not have the error, please check it." */
    TESSEL_ERR_PLUGIN_NOT_INIT = 1017,     /* "Plugin is not initialized." */
    TESSEL_ERR_PLUGIN_INIT = 1018,         /* "Plugin initialized failed." */
    TESSEL_ERR_PLUGIN_EXEC = 1019,         /* "Execute plugin failed." */
    TESSEL_ERR_SHARING_DISABLED = 1020,    /* "Sharing is not enabled for the object." */
    TESSEL_ERR_GROUP_LIST = 1021,          /* "Failed to get user group list." */
    TESSEL_ERR_USER_NOT_EXISTS = 1022,     /* "User not exists." */
    TESSEL_ERR_NO_PERMISSION = 1023,       /* "No permission for the object." */
    TESSEL_ERR_PGSQL_DISABLED = 1024,      /* "PostgresSQL service is disabled." */
    TESSEL_ERR_CREATE_DB = 1025,           /* "Create DB failed." */
    TESSEL_ERR_CONF_CORRUPTED = 1026,      /* "Configuration file is corrupted." */
    TESSEL_ERR_DISABLED = 1027,            /* "tessel is disabled." */
    TESSEL_ERR_NO_APP_PRIV = 1028,         /* "No application privilege for the namespace." */
    TESSEL_ERR_UPDATE_CONF = 1029,         /* "Update configuration file failed." */
    TESSEL_ERR_OWNER_INVALID = 1030,       /* "Object owner is disabled or expired." */
    TESSEL_ERR_ID_EXISTS = 1031,           /* "Object ID already exists." */
    TESSEL_ERR_MKDIR = 1032,               /* a directory could not be created */
    TESSEL_ERR_COPY_FILE = 1035,           /* a file copy failed */
    TESSEL_ERR_RENAME_TABLE = 1036,        /* a rename table could not be filled */
    TESSEL_ERR_GIT = 1037,                 /* a Git failure other than not-found */
    TESSEL_ERR_NO_SPACE = 1038             /* not enough space on the target volume */
};

/* One entry of the code table. */
typedef struct _tag_TESSEL_ERROR_STRING {
    int code;
    const char *message;  /* English text, never NULL */
    const char *section;  /* user-interface string-table section, or NULL */
    const char *key;      /* user-interface string-table key, or NULL */
} TESSEL_ERROR_STRING;

TESSEL_C_BEGIN

/*
 * The code table, 1000 to 1031 in a fixed order (1005 stands before 1004).
 * The codes below 1000 and above 1031 have no entry, so a report of one of
 * them carries no "ErrNo" line.
 */
#define TESSEL_ERROR_STRING_COUNT 32
TESSEL_EXPORT extern const TESSEL_ERROR_STRING rgErrorString[TESSEL_ERROR_STRING_COUNT];

/* Starts a new error: the stack afterwards holds exactly this frame. */
TESSEL_EXPORT void TesselErrSetEx(int code, const char *szFile, int line, const char *szFormat, ...)
    __attribute__((format(printf, 4, 5)));
/* Adds a place to the current error (no "code"). */
TESSEL_EXPORT void TesselErrAppendEx(const char *szFile, int line, const char *szFormat, ...)
    __attribute__((format(printf, 3, 4)));
/* 0 for an empty stack, -1 when frame 0 has no code, else frame 0's code. */
TESSEL_EXPORT int TesselErrCodeGet(void);
/* Writes the stack to the system log; nothing for an empty stack. */
TESSEL_EXPORT void TesselErrSyslog(void);
/* Writes the stack to a stream (standard error when NULL); nothing for an empty stack. */
TESSEL_EXPORT void TesselErrPrint(FILE *stream);

TESSEL_C_END

#ifdef __cplusplus
/* This thread's error stack: a JSON array of frames {"code", "file", "line", "msg"}. */
TESSEL_EXPORT Json::Value &TesselErrMsgGet();
/*
 * The user-interface string key of a code (NULL for every code but 1000), its
 * section stored in *pszSection ("" when none). For an unknown code: "" and
 * *pszSection untouched. The English message is deliberately not returned
 * here; it is part of TesselErrSyslog / TesselErrPrint.
 */
TESSEL_EXPORT const char *TesselErrGetString(int code, const char **pszSection = NULL);
#endif

#endif /* TESSEL_ERROR_H */
