// The platform's growable list of strings. A list is one allocation (header
// and slot array together), which is why pushes take a pointer to the pointer:
// growing moves the list.
#include <stdlib.h>
#include <string.h>

#include "quor/qlib.h"

struct _tag_QLIBSZLIST {
    int nSize;   // slots allocated
    int nCount;  // slots used
    char *rgszValue[1];
};

namespace {

size_t ListBytes(int nSize) { return sizeof(QLIBSZLIST) + sizeof(char *) * (static_cast<size_t>(nSize) - 1); }

}  // namespace

extern "C" {

QLIBSZLIST *QLIBCSzListAlloc(int nInitialSize) {
    if (nInitialSize <= 0) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return NULL;
    }
    QLIBSZLIST *pList = static_cast<QLIBSZLIST *>(calloc(1, ListBytes(nInitialSize)));
    if (NULL == pList) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return NULL;
    }
    pList->nSize = nInitialSize;
    return pList;
}

void QLIBCSzListClear(QLIBSZLIST *pList) {
    if (NULL == pList) {
        return;
    }
    for (int i = 0; i < pList->nCount; ++i) {
        free(pList->rgszValue[i]);
        pList->rgszValue[i] = NULL;
    }
    pList->nCount = 0;
}

void QLIBCSzListFree(QLIBSZLIST *pList) {
    QLIBCSzListClear(pList);
    free(pList);
}

int QLIBCSzListPush(QLIBSZLIST **ppList, const char *szValue) {
    if (NULL == ppList || NULL == *ppList || NULL == szValue) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    QLIBSZLIST *pList = *ppList;
    if (pList->nCount == pList->nSize) {
        int nNewSize = pList->nSize * 2;
        QLIBSZLIST *pGrown = static_cast<QLIBSZLIST *>(realloc(pList, ListBytes(nNewSize)));
        if (NULL == pGrown) {
            QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
            return -1;
        }
        pList = pGrown;
        pList->nSize = nNewSize;
        *ppList = pList;
    }
    char *szCopy = strdup(szValue);
    if (NULL == szCopy) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    pList->rgszValue[pList->nCount++] = szCopy;
    return pList->nCount;
}

int QLIBCSzListCount(const QLIBSZLIST *pList) { return (NULL == pList) ? 0 : pList->nCount; }

const char *QLIBCSzListGet(const QLIBSZLIST *pList, int idx) {
    if (NULL == pList || idx < 0 || idx >= pList->nCount) {
        return NULL;
    }
    return pList->rgszValue[idx];
}

}  // extern "C"
