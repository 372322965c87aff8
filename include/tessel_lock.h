/*
 * File locks and lockers.
 *
 * Object operations take shared locks at up to three levels: one lock file per
 * object, and per namespace one for backup jobs and one for volume moves. A
 * reader takes the backup and volume locks with a single try, so an ordinary
 * operation fails at once (901 / 900) while a backup or move runs; writers
 * (the jobs) wait up to 30 s for the readers.
 *
 * These are POSIX record locks and belong to the process: two threads of one
 * process do not exclude each other through them, and closing any descriptor
 * of a lock file in the process drops the process's lock on it. Use one
 * locker per operation, on one thread.
 */
#ifndef TESSEL_LOCK_H
#define TESSEL_LOCK_H

#include <stdint.h>

#include <string>

#include <json/value.h>

#include "tessel_export.h"

enum {
    TESSEL_LOCK_BACKUP_OBJECT = 2,
    TESSEL_LOCK_VOLUME = 4,
    TESSEL_LOCK_BACKUP = 8,
    TESSEL_LOCK_BACKUP_OBJECT_VOLUME = 6,
    TESSEL_LOCK_ALL = 14
};

/*
 * An advisory record lock over a whole lock file, created (mode 0644) as root
 * when missing. Closing the descriptor (Close, destruction) drops the lock, as
 * does closing any other descriptor of the same file in this process: never
 * keep two of these on one file where one may go before the other.
 */
class TESSEL_EXPORT TESSEL_FILE_LOCK {
public:
    explicit TESSEL_FILE_LOCK(const std::string &strFileName);
    ~TESSEL_FILE_LOCK();
    TESSEL_FILE_LOCK(const TESSEL_FILE_LOCK &) = delete;
    TESSEL_FILE_LOCK &operator=(const TESSEL_FILE_LOCK &) = delete;

    bool Open(const std::string &strFileName);
    /* type 0 shared, 1 exclusive; timeout in seconds (0: one try, -1: for ever). */
    bool Lock(int type, int64_t timeout);
    bool WriteLock(int64_t timeout = 30);
    bool ReadLock(int64_t timeout = 30);
    bool TryLock();
    bool UnLock();
    void Close();

private:
    int fd_;
};

class TESSEL_EXPORT TESSEL_LOCKER_BASIC {
public:
    virtual ~TESSEL_LOCKER_BASIC();
    bool ReadLock(int64_t timeout = 30);
    bool WriteLock(int64_t timeout = 30);

protected:
    TESSEL_LOCKER_BASIC();
    TESSEL_FILE_LOCK *m_pFileLock;
};

/* "<namespace scratch directory>/<id>.lock". Without that directory, or for an
 * id that is not a single path component, there is no lock file and every lock
 * fails; likewise below for a namespace that is not one. */
class TESSEL_EXPORT TESSEL_LOCKER_BACKUP_OBJECT : public TESSEL_LOCKER_BASIC {
public:
    TESSEL_LOCKER_BACKUP_OBJECT(const std::string &strNs, const std::string &strId);
};

/* "/var/lock/tessel_volume_move_<ns>.lock". */
class TESSEL_EXPORT TESSEL_LOCKER_VOLUME : public TESSEL_LOCKER_BASIC {
public:
    explicit TESSEL_LOCKER_VOLUME(const std::string &strNs);
};

/* "/var/lock/tessel_backup_<ns>.lock". */
class TESSEL_EXPORT TESSEL_LOCKER_BACKUP : public TESSEL_LOCKER_BASIC {
public:
    explicit TESSEL_LOCKER_BACKUP(const std::string &strNs);
};

struct TESSEL_LOCKER_PRIVATE;

/* The locks of one operation, released by UnLock or on destruction. */
class TESSEL_EXPORT TESSEL_LOCKER {
public:
    TESSEL_LOCKER();
    ~TESSEL_LOCKER();
    TESSEL_LOCKER(const TESSEL_LOCKER &) = delete;
    TESSEL_LOCKER &operator=(const TESSEL_LOCKER &) = delete;

    /* id: an object id or an array of ids (more than 300 take the namespace
     * backup lock instead of one lock each). */
    bool ReadLock(int level, const std::string &strNs, const Json::Value &id);
    bool WriteLock(int level, const std::string &strNs, const Json::Value &id);
    /* Releases everything; the locker cannot lock again afterwards. */
    bool UnLock();

private:
    TESSEL_LOCKER_PRIVATE *m_impl;
};

#endif /* TESSEL_LOCK_H */
