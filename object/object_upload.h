/*
 * The files and stored binaries a create or set asks the store to copy,
 * checked against what the requester may read before the store, which works
 * as root, reaches them.
 */
#ifndef TESSEL_OBJECT_OBJECT_UPLOAD_H
#define TESSEL_OBJECT_OBJECT_UPLOAD_H

#include <json/value.h>

namespace tessel {

/*
 * Every "binary_files" and "metabinary_files" item of jParm that the store
 * would copy from a "path" must name a regular file the calling process can
 * open for reading with its effective ids (1007 otherwise); every item
 * copying from another object ("object") must name one the requester may
 * read ("ro", "rw" or "owner"; a refused read's error, or 1023). Items the
 * store refuses by itself (no object, no name) are left to it. Must run
 * outside the privilege-raising section; jParm must hold "ns" (string) and
 * "requester" (unsigned).
 */
bool CheckUploadSources(const Json::Value &jParm);

}  // namespace tessel

#endif /* TESSEL_OBJECT_OBJECT_UPLOAD_H */
