// The platform's string-to-string hash. Keys keep their insertion order, so
// enumeration is reproducible (callers build file lists and SQL from it).
#include <stdlib.h>

#include <new>
#include <string>
#include <unordered_map>
#include <vector>

#include "quor/qlib.h"

struct _tag_QLIBSZHASH {
    std::unordered_map<std::string, std::string> values;
    std::vector<std::string> order;
};

extern "C" {

QLIBSZHASH *QLIBCSzHashAlloc(int nInitialSize) {
    if (nInitialSize <= 0) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return NULL;
    }
    QLIBSZHASH *pHash = new (std::nothrow) QLIBSZHASH();
    if (NULL == pHash) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return NULL;
    }
    pHash->values.reserve(static_cast<size_t>(nInitialSize));
    return pHash;
}

void QLIBCSzHashFree(QLIBSZHASH *pHash) { delete pHash; }

int QLIBCSzHashSetValue(QLIBSZHASH *pHash, const char *szKey, const char *szValue) {
    if (NULL == pHash || NULL == szKey || NULL == szValue) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    auto inserted = pHash->values.insert_or_assign(szKey, szValue);
    if (inserted.second) {
        pHash->order.emplace_back(szKey);
    }
    return 0;
}

const char *QLIBCSzHashGetValue(const QLIBSZHASH *pHash, const char *szKey) {
    if (NULL == pHash || NULL == szKey) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return NULL;
    }
    auto it = pHash->values.find(szKey);
    return (it == pHash->values.end()) ? NULL : it->second.c_str();
}

int QLIBCSzHashRemove(QLIBSZHASH *pHash, const char *szKey) {
    if (NULL == pHash || NULL == szKey) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    if (0 == pHash->values.erase(szKey)) {
        return -1;
    }
    for (auto it = pHash->order.begin(); it != pHash->order.end(); ++it) {
        if (*it == szKey) {
            pHash->order.erase(it);
            break;
        }
    }
    return 0;
}

int QLIBCSzHashCount(const QLIBSZHASH *pHash) {
    return (NULL == pHash) ? 0 : static_cast<int>(pHash->values.size());
}

int QLIBCSzHashEnumKey(const QLIBSZHASH *pHash, QLIBSZLIST **ppList) {
    if (NULL == pHash || NULL == ppList || NULL == *ppList) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    for (const std::string &key : pHash->order) {
        if (0 > QLIBCSzListPush(ppList, key.c_str())) {
            return -1;
        }
    }
    return static_cast<int>(pHash->order.size());
}

}  // extern "C"
