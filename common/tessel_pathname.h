/*
 * Names that become one component of a file-system path.
 *
 * A namespace name or an object identifier is joined into paths under the
 * store's directories ("<repo>/<ns>/<id>/..."); one that contains "/" or a
 * NUL byte, or that is "." or "..", would name a directory other than its
 * own. Every function that joins such a name into a path refuses it with
 * 1007 and the condition text "!TesselIsPathComponent(<name>)" after its own
 * checks (empty names keep theirs).
 */
#ifndef TESSEL_COMMON_TESSEL_PATHNAME_H
#define TESSEL_COMMON_TESSEL_PATHNAME_H

#include <string>

namespace tessel {

/* True when strName is non-empty, not "." or "..", and has no '/' or NUL. */
bool TesselIsPathComponent(const std::string &strName);

}  // namespace tessel

#endif /* TESSEL_COMMON_TESSEL_PATHNAME_H */
