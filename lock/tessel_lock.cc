// The lockers an operation holds: per object, per namespace for volume moves
// and for backups; see tessel_lock.h.
#include <memory>
#include <string>
#include <vector>

#include "common/tessel_pathname.h"
#include "common/tessel_report.h"
#include "tessel_error.h"
#include "tessel_lock.h"
#include "tessel_ns.h"

static constexpr const char kTesselModule[] = "lock/tessel_lock";

namespace {

constexpr const char kLockDir[] = "/var/lock/";
constexpr const char kVolumeLockPrefix[] = "tessel_volume_move_";
constexpr const char kBackupLockPrefix[] = "tessel_backup_";
constexpr const char kLockSuffix[] = ".lock";
// An operation on more objects than this takes the namespace backup lock
// instead of one lock (and one open descriptor) per object.
constexpr Json::ArrayIndex kMaxObjectLocks = 300;

// "/var/lock/<prefix><ns>.lock"; null for a namespace that would name a file elsewhere.
TESSEL_FILE_LOCK *NamespaceFileLock(const char *szPrefix, const std::string &strNs) {
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNs), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNs)",
                 nullptr);
    return new TESSEL_FILE_LOCK(kLockDir + (szPrefix + strNs) + kLockSuffix);
}

}  // namespace

TESSEL_LOCKER_BASIC::TESSEL_LOCKER_BASIC() : m_pFileLock(nullptr) {}

TESSEL_LOCKER_BASIC::~TESSEL_LOCKER_BASIC() { delete m_pFileLock; }

bool TESSEL_LOCKER_BASIC::ReadLock(int64_t timeout) { return m_pFileLock && m_pFileLock->ReadLock(timeout); }

bool TESSEL_LOCKER_BASIC::WriteLock(int64_t timeout) { return m_pFileLock && m_pFileLock->WriteLock(timeout); }

TESSEL_LOCKER_BACKUP_OBJECT::TESSEL_LOCKER_BACKUP_OBJECT(const std::string &strNs, const std::string &strId) {
    std::string strTmpDir;
    if (!TesselGetNSTmpDir(strNs, strTmpDir)) {
        TESSEL_APPEND("!TesselGetNSTmpDir(strNs, strTmpDir)");
        return;
    }
    if (!tessel::TesselIsPathComponent(strId)) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strId)");
        return;
    }
    m_pFileLock = new TESSEL_FILE_LOCK(strTmpDir + "/" + strId + kLockSuffix);
}

TESSEL_LOCKER_VOLUME::TESSEL_LOCKER_VOLUME(const std::string &strNs) {
    m_pFileLock = NamespaceFileLock(kVolumeLockPrefix, strNs);
}

TESSEL_LOCKER_BACKUP::TESSEL_LOCKER_BACKUP(const std::string &strNs) {
    m_pFileLock = NamespaceFileLock(kBackupLockPrefix, strNs);
}

struct TESSEL_LOCKER_PRIVATE {
    // Declared in the order of acquisition, so destruction releases in reverse.
    std::vector<std::unique_ptr<TESSEL_LOCKER_BACKUP_OBJECT>> vecObjLock_;
    std::unique_ptr<TESSEL_LOCKER_VOLUME> pVolLock_;
    std::unique_ptr<TESSEL_LOCKER_BACKUP> pBackupLock_;

    // Stores a locker per id (id: one id or an array of ids); false when there
    // are too many, and the namespace backup lock has to stand in for them.
    bool AddObjectLockers(const std::string &strNs, const Json::Value &id) {
        if (id.isString()) {
            vecObjLock_.emplace_back(new TESSEL_LOCKER_BACKUP_OBJECT(strNs, id.asString()));
            return true;
        }
        if (!id.isArray()) {
            return true;
        }
        if (kMaxObjectLocks < id.size()) {
            return false;
        }
        for (const Json::Value &jId : id) {
            // A non-text entry names no lock file and so fails to lock.
            vecObjLock_.emplace_back(new TESSEL_LOCKER_BACKUP_OBJECT(strNs, jId.isString() ? jId.asString() : ""));
        }
        return true;
    }

    // A second locker of a file must never outlive the first: closing either
    // descriptor drops this process's lock, so the old one goes first.
    void NewVolumeLocker(const std::string &strNs) {
        pVolLock_.reset();
        pVolLock_.reset(new TESSEL_LOCKER_VOLUME(strNs));
    }
    void NewBackupLocker(const std::string &strNs) {
        pBackupLock_.reset();
        pBackupLock_.reset(new TESSEL_LOCKER_BACKUP(strNs));
    }
};

TESSEL_LOCKER::TESSEL_LOCKER() : m_impl(new TESSEL_LOCKER_PRIVATE) {}

TESSEL_LOCKER::~TESSEL_LOCKER() {
    if (m_impl) {
        UnLock();
    }
}

// Readers try the volume and backup locks once: an operation fails at once
// while a volume move or backup runs rather than holding up the job.
bool TESSEL_LOCKER::ReadLock(int level, const std::string &strNs, const Json::Value &id) {
    TESSEL_CHECK_APPEND(!m_impl, "!m_impl", false);
    if (TESSEL_LOCK_BACKUP_OBJECT & level) {
        if (!m_impl->AddObjectLockers(strNs, id)) {
            m_impl->NewBackupLocker(strNs);
            TESSEL_CHECK(!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0), TESSEL_ERR_LOCK_BACKUP,
                         "!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)", false);
        }
        for (auto it = m_impl->vecObjLock_.begin(); it != m_impl->vecObjLock_.end(); ++it) {
            TESSEL_CHECK(!(*it) || !((*it)->ReadLock()), TESSEL_ERR_LOCK_OBJECT, "!(*it) || !((*it)->ReadLock())",
                         false);
        }
    }
    if (TESSEL_LOCK_VOLUME & level) {
        m_impl->NewVolumeLocker(strNs);
        TESSEL_CHECK(!m_impl->pVolLock_ || !m_impl->pVolLock_->ReadLock(0), TESSEL_ERR_LOCK_VOLUME,
                     "!m_impl->pVolLock_ || !m_impl->pVolLock_->ReadLock(0)", false);
    }
    if ((TESSEL_LOCK_BACKUP & level) && !m_impl->pBackupLock_) {
        m_impl->NewBackupLocker(strNs);
        TESSEL_CHECK(!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0), TESSEL_ERR_LOCK_BACKUP,
                     "!m_impl->pBackupLock_ || !m_impl->pBackupLock_->ReadLock(0)", false);
    }
    return true;
}

// Writers are the jobs: they wait for running operations to finish.
bool TESSEL_LOCKER::WriteLock(int level, const std::string &strNs, const Json::Value &id) {
    TESSEL_CHECK_APPEND(!m_impl, "!m_impl", false);
    if (TESSEL_LOCK_BACKUP_OBJECT & level) {
        if (!m_impl->AddObjectLockers(strNs, id)) {
            m_impl->NewBackupLocker(strNs);
            TESSEL_CHECK(!m_impl->pBackupLock_ || !m_impl->pBackupLock_->WriteLock(), TESSEL_ERR_LOCK_BACKUP,
                         "!m_impl->pBackupLock_ || !m_impl->pBackupLock_->WriteLock()", false);
        }
        for (auto it = m_impl->vecObjLock_.begin(); it != m_impl->vecObjLock_.end(); ++it) {
            TESSEL_CHECK(!(*it) || !((*it)->WriteLock()), TESSEL_ERR_LOCK_OBJECT, "!(*it) || !((*it)->WriteLock())",
                         false);
        }
    }
    if (TESSEL_LOCK_VOLUME & level) {
        m_impl->NewVolumeLocker(strNs);
        TESSEL_CHECK(!m_impl->pVolLock_ || !m_impl->pVolLock_->WriteLock(), TESSEL_ERR_LOCK_VOLUME,
                     "!m_impl->pVolLock_ || !m_impl->pVolLock_->WriteLock()", false);
    }
    if ((TESSEL_LOCK_BACKUP & level) && !m_impl->pBackupLock_) {
        m_impl->NewBackupLocker(strNs);
        TESSEL_CHECK(!m_impl->pBackupLock_ || !m_impl->pBackupLock_->WriteLock(), TESSEL_ERR_LOCK_BACKUP,
                     "!m_impl->pBackupLock_ || !m_impl->pBackupLock_->WriteLock()", false);
    }
    return true;
}

bool TESSEL_LOCKER::UnLock() {
    TESSEL_CHECK_APPEND(!m_impl, "!m_impl", false);
    delete m_impl;
    m_impl = nullptr;
    return true;
}
