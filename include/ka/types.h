/* Basic types shared by every public header. */
#ifndef KA_TYPES_H
#define KA_TYPES_H

#include <stdint.h>

/* The platform's 32-bit boolean: 0 false, 1 true. */
typedef int32_t KA_BOOL;

#endif /* KA_TYPES_H */
