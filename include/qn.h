/*
 * qn.h - the scalar types that every library of the family uses.
 *
 * Valid C11 and C++. Nothing here needs a library to link against.
 */
#ifndef QN_H
#define QN_H

#include <stdint.h>

typedef char qn_char_t;       /* one byte of text */
typedef char *qn_char_ptr_t;  /* a NUL-terminated string, or a buffer for one */
typedef int32_t qn_int32_t;   /* signed, 32 bits; also the type of every status code */
typedef int64_t qn_int64_t;   /* signed, 64 bits */
typedef uint8_t qn_uint8_t;   /* unsigned, 8 bits */
typedef uint16_t qn_uint16_t; /* unsigned, 16 bits */
typedef uint32_t qn_uint32_t; /* unsigned, 32 bits */
typedef uint64_t qn_uint64_t; /* unsigned, 64 bits */

/* Marks a function that its shared library exports. */
#if defined(__GNUC__)
#define QN_EXPORT __attribute__((visibility("default")))
/* Lets the compiler check a printf-like call: the format is argument FORMAT, its inserts start at FIRST (0: va_list). */
#define QN_PRINTF_LIKE(FORMAT, FIRST) __attribute__((format(printf, FORMAT, FIRST)))
#else
#define QN_EXPORT
#define QN_PRINTF_LIKE(FORMAT, FIRST)
#endif

#ifdef __cplusplus
#define QN_BEGIN_DECLS extern "C" {
#define QN_END_DECLS }
#else
#define QN_BEGIN_DECLS
#define QN_END_DECLS
#endif

#endif /* QN_H */
