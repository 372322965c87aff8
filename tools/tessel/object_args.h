/* What get, create and set share: their options and parameters, and how a record is shown. */
#ifndef TESSEL_TOOLS_OBJECT_ARGS_H
#define TESSEL_TOOLS_OBJECT_ARGS_H

#include <json/value.h>
#include <tessel/tessel.h>

#include "cli.h"
#include "files.h"

namespace tessel_cli {

extern const Option kNs, kId, kVersion, kField, kText, kMetatext, kBinary, kMetabinary, kCommitMsg;

/* The fields shown of a record: everything a reader may see. */
Json::Value ShownFields();
/* params[key] must be an object (or absent: it becomes {}) so that options can add to it. */
bool ObjectMember(Json::Value &params, const char *key, const char *option);
/* The same for an array. */
bool ArrayMember(Json::Value &params, const char *key, const char *option);
/* PARAMS, then --ns, --id, --version, --field, then the requester. */
bool CommonParams(const Context &ctx, const Args &args, Json::Value &params);
/* --commit-msg, --text, --metatext, --binary, --metabinary. */
bool ContentParams(const Args &args, Json::Value &params, ScratchCopies &copies);
/* The record as JSON on standard output. */
int PrintRecord(const Context &ctx, const TESSEL_OBJECT &obj, const Json::Value &jField);

}  // namespace tessel_cli

#endif /* TESSEL_TOOLS_OBJECT_ARGS_H */
