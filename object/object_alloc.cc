// Life cycle of records and chains of records.
#include <new>

#include "common/tessel_report.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_alloc";

extern "C" {

TESSEL_OBJECT *TesselObjectAlloc(void) {
    TESSEL_OBJECT *pObject = NULL;
    TESSEL_CHECK(NULL == (pObject = new (std::nothrow) TESSEL_OBJECT), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pObject = (TESSEL_OBJECT *)new TESSEL_OBJECT)", NULL);
    // A record without its data block would answer every call with nothing;
    // to the caller that is the same failed allocation.
    if (NULL == pObject->m_impl) {
        delete pObject;
        TESSEL_RAISE(TESSEL_ERR_OUT_OF_MEMORY, "NULL == (pObject = (TESSEL_OBJECT *)new TESSEL_OBJECT)");
        return NULL;
    }
    return pObject;
}

void TesselObjectFreeList(TESSEL_OBJECT *pHead) {
    // Iterative: chains of list operations can be long.
    while (NULL != pHead) {
        TESSEL_OBJECT *pNext = pHead->next;
        delete pHead;
        pHead = pNext;
    }
}

TESSEL_OBJECT *TesselObjectNext(TESSEL_OBJECT *pObject) { return (NULL == pObject) ? NULL : pObject->next; }

void TesselObjectClear(TESSEL_OBJECT *pObject) {
    if (NULL != pObject) {
        pObject->clear();
    }
}

}  // extern "C"

TESSEL_OBJECT_LIST::TESSEL_OBJECT_LIST() : m_head(NULL) {}

TESSEL_OBJECT_LIST::~TESSEL_OBJECT_LIST() { clear(); }

size_t TESSEL_OBJECT_LIST::size() const {
    size_t n = 0;
    for (const TESSEL_OBJECT *p = m_head; NULL != p; p = p->next) {
        ++n;
    }
    return n;
}

void TESSEL_OBJECT_LIST::clear() {
    TesselObjectFreeList(m_head);
    m_head = NULL;
}
