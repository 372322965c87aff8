/*
 * How a list get deals its records to worker threads: record i (from 0, in
 * list order) goes to worker i mod 30, so worker k reads records k, k+30,
 * k+60, ... in that order, each worker on its own thread with its own store.
 */
#ifndef TESSEL_OBJECT_LIST_OBJECT_GET_H
#define TESSEL_OBJECT_LIST_OBJECT_GET_H

#include <map>
#include <vector>

#include <json/value.h>

#include "tesselobject.h"

/* One worker: the request (shared, read only) and the records it reads. */
struct Thread_Info {
    const Json::Value *pParm = nullptr;
    std::vector<TESSEL_OBJECT *> vObjs;
};

namespace tessel {

constexpr unsigned int kMaxGetWorkers = 30;

/* Fills mapThreads (worker number -> its share) with the records from pHead. */
void DealToWorkers(const Json::Value &jParm, TESSEL_OBJECT *pHead, std::map<unsigned int, Thread_Info> &mapThreads);

}  // namespace tessel

#endif /* TESSEL_OBJECT_LIST_OBJECT_GET_H */
