/* URL joining and resolution. Every function works on caller-owned, zero-terminated buffers of
 * 2048 bytes, returns 0 and allocates nothing. Inputs may be of any length: results are cut to
 * 2047 characters and always terminated. */
#ifndef KA_URI_H
#define KA_URI_H

#include <stdint.h>

#include "ka/export.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Writes ref seen from base into out: ref alone when it names an absolute scheme, else the
 * directory (or, for a ref starting with "/", the origin) of base followed by ref. Does nothing
 * when any argument is null. */
KA_API uint32_t CombineURL(char* out, char* ref, char* base);

/* Resolves ref against base in the manner of RFC 3986 section 5.2 into out. A null or empty base
 * copies ref. Does nothing when out is null. */
KA_API uint32_t ResolveURI(char* out, char* ref, char* base);

/* Splits uri into its components, each without its separator (":", "//", "?", "#"). Any output
 * may be null and is then skipped; a null or empty uri leaves every output untouched. The first
 * "//" anywhere behind the scheme starts the authority, which runs to the next "/". */
KA_API uint32_t GetComponentOfURI(char* scheme, char* authority, char* path, char* query,
                                  char* fragment, char* uri);

/* Appends the dot-free form of the path in to out (RFC 3986 section 5.2.4). in is rewritten
 * while working. */
KA_API uint32_t RemoveDotSegments(char* out, char* in);

/* Writes the merge of refPath onto the base's path into out (RFC 3986 section 5.2.3). */
KA_API uint32_t MergeURIPath(char* out, char* baseAuthority, char* basePath, char* refPath);

/* Writes the URI recomposed from its components into out (RFC 3986 section 5.3); empty or null
 * components are left out, the path is always written. */
KA_API uint32_t GeneateURI(char* scheme, char* authority, char* path, char* query, char* fragment,
                           char* out);

#ifdef __cplusplus
}
#endif

#endif /* KA_URI_H */
