/*
 * qn_tr.h - the tracing library: a high-rate, low-cost binary record of what a program does.
 *
 * A client registers one or more components, each with a table of categories, and then writes records. Each category
 * has a level of detail, one byte of the client's own memory that the library keeps up to date; the client tests that
 * byte (QN_TR_IS_ON below) and calls a record writer only when the record is wanted. Records go into a ring inside a
 * memory-mapped file, the newest overwriting the oldest, and survive the death of the process.
 *
 *     static tr_detail_level_t levels[2];
 *     static const tr_category_description_t categories[2] = {
 *         {0, "Errors", 1, 1}, // id, name, default level, minimum level
 *         {1, "Flow", 1, 0},
 *     };
 *     tr_set_filename_1("/tmp/app.trc");
 *     tr_register_component_1("APP", levels, categories, 2);
 *     QN_TR_IF(levels, 0, 1, tr_record_values_64_1("APP", 17, 2, (qn_int64_t)done, (qn_int64_t)total));
 *
 * RULES THAT HOLD FOR EVERY FUNCTION, UNLESS IT SAYS OTHERWISE
 *
 * Status      0 is success, a positive number one of the QN_TR_E... codes below; -1 says that memory ran out for a page
 *             of a page set. The control functions also leave the calling thread's error record (cu_get_error_1 of
 *             qn_cu.h) with the code, 14 for -1, and a message; on success they record that no error occurred. The
 *             record writers return bare codes and leave the error record alone.
 * Strings     are NUL-terminated bytes, copied during the call; the caller keeps its own.
 * Threads     Every function may be called from any thread at any time.
 * Signals     A signal handler may write records to a trace that is a single file with the writers that neither format
 *             nor take an error (identifiers, strings, data, values). A writer that finds that the handler interrupted
 *             this library on the same thread writes nothing and returns 9. A handler must keep errno itself. No other
 *             function may be called from a handler: they allocate memory, and so does a page set when a page is full.
 * Cancelling  A thread cancelled (deferred cancellation) inside a call releases every lock that the call had taken and
 *             undoes what was half made. Asynchronous cancellation is not supported.
 * Fork        In a child made by fork() after the library was initialised tracing is off for good: writers return 0 and
 *             write nothing, and no file of the parent is touched. One forked before that traces like any process.
 * Start-up    is lazy: the first call that needs the library reads the environment (QN_TR_FILENAME, QN_TR_SIZE,
 *             QN_TR_DEBUG_LEVEL, QN_TR_USE_MSYNC, QN_TR_TRACE_LEVELS, QN_TR_FILE_MAP, QN_TR_FILE_SIZE, QN_TR_SPOOL)
 *             and registers tr_term() with atexit().
 * Files       Nobody may truncate a trace file that a running program traces to, or has opened for queries: the
 *             program's next record or query there would end it with SIGBUS. Remove or rename the file instead.
 *             One process at a time writes a trace file or page set. Two that do it at once overwrite each other's
 *             records, some of them without a trace; neither is harmed otherwise, and the next one that starts the
 *             trace goes on with it. Within a process a file is one trace: one that is to be started while it is in
 *             use under another name - a link to it, "./f" for "f", a page of a page set - is refused with
 *             QN_TR_EOPEN (error EBUSY), and nothing is recorded there until a control function starts it again.
 * Stopped     After tr_term(), and in such a child, tracing is stopped for good. The writers, tr_set_multipage_1,
 *             tr_set_file_map_1 and the size functions then return 0 and do nothing. Registering after tr_term()
 *             initialises the library again and starts the file that QN_TR_FILENAME names, but nothing is recorded, and
 *             the component cannot be unregistered (9).
 */
#ifndef QN_TR_H
#define QN_TR_H

#include <stdarg.h>
#include <sys/types.h>

#include <qn.h>
#include <qn_cu.h>

QN_BEGIN_DECLS

/* ---------------------------------------------------------------------------------------------------------------- */
/* Status codes. Where a message number differs from the code, the code is what programs test.                      */
/* ---------------------------------------------------------------------------------------------------------------- */

enum {
    QN_TR_ECATCOUNT = 1,       /* number of categories is 0 or above 255 */
    QN_TR_ECOMPID = 2,         /* component identifier missing */
    QN_TR_ECATLIST = 3,        /* category descriptions missing */
    QN_TR_ELEVELS = 4,         /* level array missing */
    QN_TR_ECATNAME = 5,        /* a category has no name */
    QN_TR_ECATID = 6,          /* a category_id is not below the number of categories */
    QN_TR_EDEFLEVEL = 7,       /* a default level is above 255 */
    QN_TR_EMINLEVEL = 8,       /* a minimum level is above 255 */
    QN_TR_ELOCK = 9,           /* a lock could not be taken; from tr_unregister_component_1 also: tracing is stopped */
    QN_TR_ESPECCOMP = 10,      /* specification: component pattern expected */
    QN_TR_ESPECSEP = 11,       /* specification: separator expected */
    QN_TR_ESPECCAT = 12,       /* specification: category pattern expected */
    QN_TR_ESPECLEVEL = 13,     /* specification: level expected */
    QN_TR_ENOMEM = 14,         /* memory allocation failed */
    QN_TR_ECOMPREGEX = 15,     /* specification: component pattern is no regular expression */
    QN_TR_ECATREGEX = 16,      /* specification: category pattern is no regular expression */
    QN_TR_EFILENAME = 17,      /* file name invalid, or no such trace file is known */
    QN_TR_EOPEN = 18,          /* the file could not be opened, or is in use under another name */
    QN_TR_EFSTAT = 19,         /* fstat() failed, or the file system cannot hold trace files */
    QN_TR_ENOTREG = 20,        /* not a regular file */
    QN_TR_EMMAP = 21,          /* mmap() failed */
    QN_TR_ERESIZE = 22,        /* the file's size could not be changed */
    QN_TR_ECLEAR = 23,         /* the file's new space could not be written */
    QN_TR_WINACTIVE = 25,      /* a warning with a result: the trace is not active, the size is the requested one */
    QN_TR_ENOTREGISTERED = 26, /* no such component */
    QN_TR_ESTRING = 27,        /* a string is NULL or empty */
    QN_TR_EFORMAT = 28,        /* vsnprintf() failed */
    QN_TR_EBLOCKCOUNT = 29,    /* more than 128 data blocks */
    QN_TR_EBLOCKPTR = 30,      /* a data block's pointer is NULL */
    QN_TR_EBLOCKLEN = 31,      /* a data block is longer than 1 MiB, or its length negative */
    QN_TR_EMSYNC = 32,         /* msync() failed */
    QN_TR_ENOFORMAT = 33,      /* the format is NULL or empty */
    QN_TR_ESTRCOUNT = 34,      /* number of strings is 0 or above 32 */
    QN_TR_ENOSPACE = 35,       /* not enough free space in the file system */
    QN_TR_ENOTTRACE = 36,      /* not a trace file */
    QN_TR_EHANDLE = 37,        /* query handle invalid */
    QN_TR_EINUSE = 38,         /* component identifier already registered */
    QN_TR_ECONFOPEN = 48,      /* the configuration file could not be opened or read */
    QN_TR_EWRITE = 49          /* write() failed while a page or file was copied; only in the spool thread's record */
};

/* ---------------------------------------------------------------------------------------------------------------- */
/* Components, categories and levels                                                                                */
/* ---------------------------------------------------------------------------------------------------------------- */

/* The current level of detail of one category: 0 is off, a higher level asks for more detail. */
typedef qn_uint8_t tr_detail_level_t;

/* A trace file, as the tr_ms_ functions take it. NULL means the default trace file. Owned by the library, valid for
 * the life of the process. */
struct trace_anchor;
typedef struct trace_anchor *tr_file_token_t;

/* One category of a component, supplied by the client and copied by the registration. */
typedef struct tr_category_description {
    qn_uint32_t category_id;             /* index of the category in the level array; below the number of categories */
    const qn_char_t *category_name;      /* what level and file map specifications call it; not empty */
    qn_uint32_t default_level_of_detail; /* 0 to 255: the level that a specification without "=level" sets */
    qn_uint32_t minimum_level_of_detail; /* 0 to 255: the level at registration; a level from 0 to 255 that a
                                            specification gives is raised to it, a default level is not */
} tr_category_description_t;

/* Non-zero when CATEGORY traces at LEVEL or above. Costs one byte load and a compare. */
#if defined(__GNUC__)
#define QN_TR_IS_ON(LEVELS, CATEGORY, LEVEL)                                                                           \
    (__builtin_expect(__atomic_load_n(&(LEVELS)[(CATEGORY)], __ATOMIC_RELAXED) >= (LEVEL), 0))
#else
#define QN_TR_IS_ON(LEVELS, CATEGORY, LEVEL) (*(const volatile tr_detail_level_t *)&(LEVELS)[(CATEGORY)] >= (LEVEL))
#endif

/* Makes CALL, a call of a record writer, when CATEGORY traces at LEVEL or above; otherwise its arguments are not even
 * evaluated. A statement. */
#define QN_TR_IF(LEVELS, CATEGORY, LEVEL, CALL)                                                                        \
    do {                                                                                                               \
        if (QN_TR_IS_ON(LEVELS, CATEGORY, LEVEL)) (void)(CALL);                                                        \
    } while (0)

/*
 * Registers a component and starts every trace file that thereby has something to trace.
 *
 * pComponentId        Its first one to four characters identify the component and stand in each of its records.
 * pLevelArray         numberOfCategories bytes that belong to the client and must stay valid until the component is
 *                     unregistered or tr_term() has run. The library writes the current levels into them: here entry
 *                     i's minimum level into byte i, then what the pending level specifications say.
 * pCategoryDesc       numberOfCategories descriptions, copied.
 * numberOfCategories  1 to 255.
 * fileTokens          NULL, or receives the address of the component's token array: per entry of pCategoryDesc the
 *                     trace file that the category is mapped to (tr_set_file_map_1). The array belongs to the library
 *                     and lives until the component is unregistered.
 *
 * Two identifiers are the same when their first four characters are. Returns 0 or
 *   1, 2, 3, 4, 38, 5, 6, 7, 8  the first check that failed, in this order; nothing was changed
 *   9, 14                       lock or memory failure: nothing could be registered, or a trace file could not be made
 *                               or started. A second call tells: it returns 38 when the component is registered.
 *   -1, 17 to 23, 35            a trace file could not be started
 * A component whose trace file could not be started is registered all the same: its levels are set, and its records are
 * dropped until the file can be started.
 * The levels are written with the library's global lock held and may be read at any time without one.
 */
QN_EXPORT qn_int32_t tr_ms_register_component_1(const qn_char_t *pComponentId, tr_detail_level_t *pLevelArray,
                                                const tr_category_description_t *pCategoryDesc,
                                                const qn_uint32_t numberOfCategories, tr_file_token_t **fileTokens);

/* The same without a token array. */
QN_EXPORT qn_int32_t tr_register_component_1(const qn_char_t *pComponentId, tr_detail_level_t *pLevelArray,
                                             const tr_category_description_t *pCategoryDesc,
                                             const qn_uint32_t numberOfCategories);

/*
 * Removes a component: its level array is set to 0, so that its trace points fall silent, and every trace file that
 * has nothing left to trace is flushed and stopped. The level array may be released when this has returned.
 * Returns 0, 2 (identifier missing), 26 (not registered), or 9 (lock failure, or tracing is stopped: then nothing is
 * changed and no error is recorded).
 */
QN_EXPORT qn_int32_t tr_unregister_component_1(const qn_char_t *pComponentId);

/*
 * Sets levels by a specification, now and for every component that registers later.
 *
 *     element { "," element }     element: component-pattern ":" category-pattern [ "=" level ]
 *
 * Both patterns are POSIX extended regular expressions, matched anywhere in the name and without regard to case; a
 * lone "*" stands for ".*". The level is decimal, 0x hexadecimal or 0 octal; without it the category's default level
 * is set. A level below the category's minimum is raised to it; of a level above 255 only the low eight bits count.
 * Later elements override earlier ones. "AB:*=4,CD:Errors" is an example. The environment variable
 * QN_TR_TRACE_LEVELS holds such a specification for the start of the program.
 *
 * The specification is taken whole or not at all. pLevelString must not be NULL. Returns 0, 9, 14, or
 *   10, 11, 12, 13, 15, 16  a syntax error, with its offset in the message; no level was changed
 *   -1, 17 to 23, 35        the last trace file that now has something to trace could not be started (9 and 14 may
 *                           mean that too; the levels are set then)
 * The patterns go to regcomp() and regexec(), with the library's global lock held. One that would take these gigabytes,
 * minutes or the stack, and one with back references, is refused like one that is no regular expression (15 or 16):
 * docs/patterns.md tells what is.
 */
QN_EXPORT qn_int32_t tr_set_trace_levels_1(const qn_char_t *pLevelString);

/* One component of a snapshot. */
typedef struct tr_mini_component_anchor {
    char compId[5];                        /* the identifier, NUL-terminated */
    tr_detail_level_t *pDetailLevels;      /* a copy of its levels */
    qn_int32_t numberOfCategories;         /* entries of both arrays */
    tr_category_description_t *categories; /* category_id and category_name are set; do not read the rest */
} tr_mini_component_anchor_t;

/*
 * Gives a snapshot of all registered components, newest first: *components receives an array of *componentCount
 * records that belongs to the caller, who gives it back with tr_release_comp_info_1. Returns 0, or -1 when memory
 * runs out: *components is then NULL, and the library's global lock stays held by the calling thread, so a program
 * that sees -1 should end. Leaves the error record alone.
 */
QN_EXPORT int tr_get_current_trace_levels_1(int *componentCount, tr_mini_component_anchor_t **components);

/* Frees a snapshot. Nothing is done for a count of 0 or a NULL pointer. */
QN_EXPORT void tr_release_comp_info_1(const int componentCount, tr_mini_component_anchor_t *components);

/* ---------------------------------------------------------------------------------------------------------------- */
/* Trace files                                                                                                      */
/* ---------------------------------------------------------------------------------------------------------------- */

/*
 * Names the default trace file, which every category without a file of its own writes to, and starts it when some
 * category traces. An existing file is continued when it is sound, of exactly the size that is asked for and written by
 * the same program; otherwise its ring is initialised afresh, and a larger file stays as large as it is.
 *
 * pFileName  at most 4095 characters; longer names are cut. The current name changes nothing. An empty name ends
 *            tracing to the default file. NULL stops every trace file of the process; their names stay.
 * Returns 0, 9, or -1, 14, 17 to 23 and 35 when the file could not be started (the name is kept).
 */
QN_EXPORT qn_int32_t tr_set_filename_1(const qn_char_t *pFileName);

/* Copies the default trace file's name, possibly empty, to pFileName, which has room for 4096 characters.
 * Returns 0 or 9. */
QN_EXPORT qn_int32_t tr_get_filename_1(qn_char_t *pFileName);

/*
 * Allows (state 1) or forbids (0) that trace files started from now on are split into pages that are filled in turn.
 * Forbidden regardless of state while the file /var/qn/cfg/disable_multipage_trace_logic exists or the environment
 * variable QN_TR_DISABLE_DEFAULT_MULTIPAGE is present. Returns 0; leaves the error record alone.
 */
QN_EXPORT qn_int32_t tr_set_multipage_1(const qn_uint32_t state);

/*
 * Maps categories to a trace file of their own: selectString is component-pattern ":" category-pattern, with patterns
 * as in tr_set_trace_levels_1, one pair a call. It holds for registered components and for those that register later;
 * later maps win. The client passes the tokens that the registration gave it to the tr_ms_ writers. The environment
 * variable QN_TR_FILE_MAP holds elements "file,component:category" separated by ";".
 * Returns 0, 9, 17 when fileName is NULL, 10, 11, 12, 15, 16 for a syntax error, with its offset (nothing was changed),
 * or -1, 17 to 23 and 35 when the last trace file that now has something to trace could not be started. 14 says that
 * memory ran out: for the element (nothing was changed), a start, or a file that the map names, whose categories stay
 * with the default file until the next call.
 */
QN_EXPORT qn_int32_t tr_set_file_map_1(const char *fileName, const char *selectString);

/*
 * Asks for a size in bytes of the trace file fileName (the empty name: the default file). The size is rounded up to
 * memory pages; an existing larger file stays as large as it is. A trace that is active is stopped and started again,
 * which initialises its ring unless the file has exactly that size. The environment variables QN_TR_SIZE (default file)
 * and QN_TR_FILE_SIZE (elements "file,size" separated by ";") do the same.
 *
 * A page set is made of pages of 262144 bytes: as many as the size holds, at least 4, or as many as the configuration
 * says. Resizing one that has been started leaves their number as it is, and makes them about a quarter larger at most.
 *
 * Returns 0, 9, 17 when fileName is NULL, or -1, 14, 17 to 23 and 35 when the file could not be made or started.
 */
QN_EXPORT qn_int32_t tr_set_file_size_1(const char *fileName, const qn_uint32_t size);

/* The same for the default trace file. */
QN_EXPORT qn_int32_t tr_set_size_1(const qn_uint32_t newSize);

/*
 * Gives the size in bytes of the trace file fileName (the empty name: the default file), of a page set that of one
 * page. Returns 0 with the mapped size, 25 with the requested size when the trace is not active, 17 when there is no
 * such trace file or fileName is NULL, or 9.
 */
QN_EXPORT qn_int32_t tr_get_file_size_1(const char *fileName, qn_uint32_t *pSize);

/* The same for the default trace file. */
QN_EXPORT qn_int32_t tr_get_size_1(qn_uint32_t *pSize);

/*
 * Writes every active trace file to its disk and waits until that is done (msync with MS_SYNC). Records written
 * meanwhile may or may not be included. Records survive the process without this; it guards against the machine.
 * Returns 0, 9, or 32 when a file could not be written (files after it are not flushed).
 */
QN_EXPORT qn_int32_t tr_flush_1(void);

/*
 * Keeps the trace pages resident by touching them now, at each start of a trace and after each flush
 * (pin_or_unpin 1), or stops doing so (0). No memory is locked. Returns 0 or 9.
 */
QN_EXPORT qn_int32_t tr_pin_pages_1(int pin_or_unpin);

/*
 * Stops tracing for good: every trace file is flushed and unmapped, every component forgotten. Runs by itself at
 * exit() and when the library is unloaded. Waits up to 2 s for the spool thread. Calling it again does nothing.
 */
QN_EXPORT void tr_term(void);

/* ---------------------------------------------------------------------------------------------------------------- */
/* Record writers                                                                                                   */
/*                                                                                                                  */
/* Common to all of them:                                                                                           */
/*   pCompId    The component's identifier. Its first four bytes go into the record as they are; give shorter       */
/*              identifiers a buffer of four bytes, padded with NULs. It need not be registered.                    */
/*   traceId    A number that tells the client's trace points apart.                                                */
/*   fileToken  The trace file, NULL for the default file. The forms without "ms" write to the default file.        */
/* A writer never tests levels: the client does (QN_TR_IF). It takes the trace file's lock, which other threads     */
/* hold for the time of one record, and allocates no memory. A thread that has written many records to a file in a  */
/* row has its lock to itself, and the next one takes it away by one call of membarrier(2); apart from that, and    */
/* from waiting for the lock, a writer makes no system call. There are two exceptions. Another process that reads   */
/* the file may ask it to wait: at most 0.5 s, and 2 s for each record that is held while it is to be overwritten.  */
/* And the record that fills a page of a page set queues that page for its copy: that allocates memory, and waits   */
/* for the copy of another page. What does not fit into half of the file's ring is cut at the end (strings, values, */
/* blocks, formatted text) or dropped (ids, errors); that is never an error, nor is a trace that is not active.     */
/* Codes common to all: 0; 2 identifier NULL or empty; 9 lock failure. While tracing is stopped every writer        */
/* returns 0 before it looks at any argument. The error record is left alone, unless there is no memory to queue a  */
/* page (14) or a damaged ring cannot be begun afresh (17 to 23, 35).                                               */
/* ---------------------------------------------------------------------------------------------------------------- */

/* Writes one number: the cheapest record, 32 bytes. */
QN_EXPORT qn_int32_t tr_record_id_1(const qn_char_t *pCompId, qn_uint32_t id);
QN_EXPORT qn_int32_t tr_ms_record_id_1(const qn_char_t *pCompId, qn_uint32_t id, tr_file_token_t fileToken);

/*
 * Write 1 to 32 strings (const char *), each with its terminator. Strings from the first one on that does not fit are
 * dropped. Return 34 for another number of strings, 27 when one of them is NULL or empty; nothing is written then.
 */
QN_EXPORT qn_int32_t tr_record_strings_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numStrings, ...);
QN_EXPORT qn_int32_t tr_record_strings_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numStrings,
                                           va_list args);
QN_EXPORT qn_int32_t tr_ms_record_strings_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                            qn_uint32_t numStrings, ...);
QN_EXPORT qn_int32_t tr_ms_record_strings_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                              qn_uint32_t numStrings, va_list args);

/* Writes one string, with the traceId 0xFFFFFFFF. Returns 27 when it is NULL or empty. */
QN_EXPORT qn_int32_t tr_record_string_1(const qn_char_t *pCompId, const qn_char_t *pString);

/*
 * Write one formatted string, cut to 1023 characters: the text of vsnprintf(), made under the trace file's lock. It
 * takes less than half the time as long as pFormat has only %d %i %u %o %x %X %c %s %p and %%, with length modifiers,
 * widths in digits and the flags - and 0; precisions, floating-point numbers and all the rest are left to vsnprintf()
 * itself. Return 33 when pFormat is NULL or empty, 28 when vsnprintf() fails; nothing is written then.
 */
QN_EXPORT qn_int32_t tr_record_fmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat,
                                            ...) QN_PRINTF_LIKE(3, 4);
QN_EXPORT qn_int32_t tr_record_vfmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFormat,
                                             va_list args) QN_PRINTF_LIKE(3, 0);
QN_EXPORT qn_int32_t tr_ms_record_fmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                               const qn_char_t *pFormat, ...) QN_PRINTF_LIKE(4, 5);
QN_EXPORT qn_int32_t tr_ms_record_vfmt_string_1(const qn_char_t *pCompId, qn_uint32_t traceId,
                                                tr_file_token_t fileToken, const qn_char_t *pFormat, va_list args)
    QN_PRINTF_LIKE(4, 0);

/* The same with the traceId 0xFFFFFFFF. */
QN_EXPORT qn_int32_t tr_record_printf_1(const qn_char_t *pCompId, const qn_char_t *pFormat, ...) QN_PRINTF_LIKE(2, 3);
QN_EXPORT qn_int32_t tr_record_vprintf_1(const qn_char_t *pCompId, const qn_char_t *pFormat, va_list args)
    QN_PRINTF_LIKE(2, 0);

/*
 * Write 0 to 128 blocks of bytes, each given as two arguments: const void *pointer, int length (0 to 1 MiB). Blocks
 * from the first one on that does not fit are dropped. Return 29 for more blocks, 30 for a NULL pointer, 31 for another
 * length; nothing is written then. A count that is negative as a signed number is written as it is, with no blocks.
 */
QN_EXPORT qn_int32_t tr_record_data_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t blkCount, ...);
QN_EXPORT qn_int32_t tr_record_data_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t blkCount,
                                        va_list args);
QN_EXPORT qn_int32_t tr_ms_record_data_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                         qn_uint32_t blkCount, ...);
QN_EXPORT qn_int32_t tr_ms_record_data_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                           qn_uint32_t blkCount, va_list args);

/* Write numValues 32-bit integers (qn_int32_t or qn_uint32_t); values that do not fit are dropped. */
QN_EXPORT qn_int32_t tr_record_values_32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, ...);
QN_EXPORT qn_int32_t tr_record_values_32_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues,
                                             va_list args);
QN_EXPORT qn_int32_t tr_ms_record_values_32_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                              qn_uint32_t numValues, ...);
QN_EXPORT qn_int32_t tr_ms_record_values_32_v_1(const qn_char_t *pCompId, qn_uint32_t traceId,
                                                tr_file_token_t fileToken, qn_uint32_t numValues, va_list args);

/* Write numValues 64-bit integers (qn_int64_t or qn_uint64_t: mind the casts of smaller ones); values that do not fit
 * are dropped. */
QN_EXPORT qn_int32_t tr_record_values_64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues, ...);
QN_EXPORT qn_int32_t tr_record_values_64_v_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t numValues,
                                             va_list args);
QN_EXPORT qn_int32_t tr_ms_record_values_64_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                              qn_uint32_t numValues, ...);
QN_EXPORT qn_int32_t tr_ms_record_values_64_v_1(const qn_char_t *pCompId, qn_uint32_t traceId,
                                                tr_file_token_t fileToken, qn_uint32_t numValues, va_list args);

/* One or two values, type-checked by the compiler. */
QN_EXPORT qn_int32_t tr_record_int32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue);
QN_EXPORT qn_int32_t tr_record_uint32_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue);
QN_EXPORT qn_int32_t tr_record_int32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int32_t iValue1,
                                         qn_int32_t iValue2);
QN_EXPORT qn_int32_t tr_record_uint32_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint32_t iValue1,
                                          qn_uint32_t iValue2);
QN_EXPORT qn_int32_t tr_record_int64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue);
QN_EXPORT qn_int32_t tr_record_uint64_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue);
QN_EXPORT qn_int32_t tr_record_int64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_int64_t iValue1,
                                         qn_int64_t iValue2);
QN_EXPORT qn_int32_t tr_record_uint64_2_1(const qn_char_t *pCompId, qn_uint32_t traceId, qn_uint64_t iValue1,
                                          qn_uint64_t iValue2);

/*
 * Write an error of the common-utilities library: pFuncName, lineNumber and pFileName say where it was noticed (both
 * names may be NULL). pErrorInfo decides which error:
 *   NULL                          the calling thread's current error
 *   a pointer to a NULL pointer   the same, and *pErrorInfo receives it: the caller releases it with cu_rel_error_1
 *   a pointer to an error         that error, which stays the caller's
 * An error whose cu_error_id is 0 is not written. An error record is never cut: one that is too long is dropped.
 */
QN_EXPORT qn_int32_t tr_record_error_1(const qn_char_t *pCompId, qn_uint32_t traceId, const qn_char_t *pFuncName,
                                       qn_uint32_t lineNumber, const qn_char_t *pFileName, cu_error_t **pErrorInfo);
QN_EXPORT qn_int32_t tr_ms_record_error_1(const qn_char_t *pCompId, qn_uint32_t traceId, tr_file_token_t fileToken,
                                          const qn_char_t *pFuncName, qn_uint32_t lineNumber,
                                          const qn_char_t *pFileName, cu_error_t **pErrorInfo);

/* ---------------------------------------------------------------------------------------------------------------- */
/* Spooling: keeping full pages                                                                                     */
/* ---------------------------------------------------------------------------------------------------------------- */

/* Gives the directory that the full pages of the trace file trc_file are copied to, making it when needed, or NULL
 * when they are not. The text belongs to the library and stays as it is for the life of the process; where pages go
 * may change with the configuration, which the next call tells. */
QN_EXPORT char *tr_get_spool_dir_1(const char *trc_file);

/*
 * Has the spool thread copy the file file_name into the directory dest, under its base name with the time added; with
 * del 1 the file is removed after that, whether the copy succeeded or not. Both strings must not be NULL; dest must stay
 * valid and unchanged until the copy is done. Returns 0 when the file was queued, or when memory ran out, which the error
 * record tells (14); 1 when a string is NULL. The copy's own result is not reported. Once tracing is stopped nothing is
 * copied any more, and the call returns 0 all the same.
 */
QN_EXPORT qn_int32_t tr_copy_file_1(const char *dest, const char *file_name, int del);

/*
 * Announces that the program will end by a core event: every start of the trace file trc_file in this process is from
 * then on marked by a restart record that carries message, until another call takes it back (message NULL). Of a page set
 * the file is the page that is active then. Both are copied. Returns 0. Not to be called by two threads at once.
 */
QN_EXPORT qn_int32_t tr_core_event_1(const char *trc_file, const char *message);

/* Has the spool thread read the configuration file again, whether it changed or not. Returns before that is done. */
QN_EXPORT void tr_configure_1(void);

/* Where one trace file is spooled. */
typedef struct tr_mini_spooling_anchor {
    char fileName[1024]; /* the trace file; a page set that is configured is followed by " (8 pages)" */
    char dest[1024];     /* the spool directory; "/dev/null": pages are reused uncopied; or "spooling not enabled" */
} tr_mini_spooling_anchor_t;

/*
 * Gives the trace files of the process, sorted by name: *spa receives an array of *cnt records that the caller gives
 * back with tr_release_spool_info_1. Returns 0, or -1 with *spa NULL. When the reason is a lack of memory, the library's
 * global lock stays held by the calling thread, so a program that sees -1 should end.
 */
QN_EXPORT qn_int32_t tr_get_current_spooling_status_1(qn_int32_t *cnt, tr_mini_spooling_anchor_t **spa);

/* Frees what tr_get_current_spooling_status_1 gave; NULL is allowed. */
QN_EXPORT void tr_release_spool_info_1(qn_int32_t cnt, tr_mini_spooling_anchor_t *spa);

/* ---------------------------------------------------------------------------------------------------------------- */
/* The configuration file /var/qn/cfg/trace.conf                                                                    */
/* ---------------------------------------------------------------------------------------------------------------- */

/* One key of a section with its value. */
typedef struct key_value {
    char key[1024];
    char *pValue;
} key_value_t;

/* One section as it stands in the file. */
typedef struct trace_raw_section {
    char sect_name[1024];
    qn_int32_t num_element;  /* entries of kv_list */
    key_value_t *kv_list;    /* in file order */
    char *pUntokenized_data; /* the section's lines; NULL when there are none */
    qn_int32_t bErr_flag;    /* 1 when the section has a syntax error */
} trace_raw_section_t;

/* A piece of the file: a section or a comment line. */
typedef struct trace_chunk {
    qn_int32_t chunk_type; /* 1: pChunk is a trace_raw_section_t; 2: pChunk is the comment line, a string */
    void *pChunk;
} trace_chunk_t;

/* The whole file. */
typedef struct trace_raw_config {
    qn_int32_t num_element;     /* entries of ppChunkLst */
    trace_chunk_t **ppChunkLst; /* in file order */
} trace_raw_config_t;

/*
 * Reads the configuration file; on success *pTraceRawConfig receives it, and the caller gives it back with
 * tr_free_trace_raw_config_1. Syntax errors mark their section and do not fail the call. Returns 0, 14, 48 (the file
 * could not be opened or read), or 42, 43, 44 (an internal pattern did not compile); on failure nothing is stored.
 * Only 14 sets the error record. Not to be called by two threads at once.
 */
QN_EXPORT qn_int32_t tr_read_conf_file_1(trace_raw_config_t **pTraceRawConfig);

/* Frees what tr_read_conf_file_1 gave; NULL is allowed. */
QN_EXPORT void tr_free_trace_raw_config_1(trace_raw_config_t *pTraceRawCfg);

/* Kinds of configuration elements. */
enum { NA = 0, TRACE_ELEMENT = 1, SPOOL_ELEMENT = 2, DEFAULT_ELEMENT = 3 };

/* A trace section: how the trace files whose names match `pattern` are spooled. */
typedef struct trace_element {
    char dest[1024];           /* where pages are copied */
    char pattern[1024];        /* regular expression for trace file names */
    qn_uint32_t pages;         /* number of pages */
    qn_uint32_t pg_size;       /* bytes a page */
    qn_uint32_t trace_size;    /* bytes in all */
    char spooling[4];          /* "ON", "OFF" or what the file says, cut to 3 characters */
    qn_uint32_t sync_interval; /* always 0 */
} trace_element_t;

/* A spool section: how a spool area is cleaned. */
typedef struct spool_element {
    char spool_dir[1024];
    char cleanup[4];
    qn_uint32_t cleanup_interval;
    qn_uint32_t retention_days;
    qn_uint32_t dir_size;
    qn_uint32_t startup_interval;
} spool_element_t;

/* The default section. */
typedef struct default_element {
    char dest[1024];
    qn_uint32_t trace_size; /* bytes; what trace sections without a "tracesize" get */
    char spooling[4];
} default_element_t;

/* One interpreted section. */
typedef struct trace_config_element {
    qn_uint32_t elementType; /* TRACE_ELEMENT, SPOOL_ELEMENT or DEFAULT_ELEMENT: which member of `element` holds */
    char sect_name[1024];
    qn_uint32_t flag; /* free for the consumer; not set in default elements */
    union {
        trace_element_t trace_element;
        spool_element_t spool_element;
        default_element_t default_element;
    } element;
} trace_config_element_t;

/* All sound sections. */
typedef struct trace_conf_data {
    qn_uint32_t num_elements;
    trace_config_element_t **pTraceConfigElement; /* in file order */
} trace_conf_data_t;

/*
 * Interprets the sound sections of a raw configuration; *pTraceConfData receives the result, which the caller gives back
 * with tr_free_trace_conf_data_1. It holds no pointers into the raw configuration. `force` has no effect. Returns 0 or
 * 14 (nothing is stored, no error is recorded).
 */
QN_EXPORT qn_int32_t tr_parse_all_sections_1(trace_raw_config_t *pTraceRawCfg, trace_conf_data_t **pTraceConfData,
                                             int force);

/* Frees what tr_parse_all_sections_1 gave; NULL is allowed. */
QN_EXPORT void tr_free_trace_conf_data_1(trace_conf_data_t *pTraceConfData);

/* ---------------------------------------------------------------------------------------------------------------- */
/* Queries: who wrote a trace file                                                                                  */
/* ---------------------------------------------------------------------------------------------------------------- */

/* An open trace file. A handle belongs to its caller; it may be used by one thread at a time. */
typedef struct trace_query_anchor *tr_query_handle_t;

/*
 * Opens the trace file file_name for queries, read-only; any regular file of at least one memory page is accepted.
 * *handle_p receives the handle, to be released with tr_close_query_1. Returns 0, 14, 17 (no name), 18 (cannot be
 * opened), 19, 20 (not a regular file), 21, or 36 (shorter than a page); *handle_p is unchanged on failure.
 */
QN_EXPORT qn_int32_t tr_open_query_1(const qn_char_t *file_name, tr_query_handle_t *handle_p);

/* Releases a handle. Returns 0, or 37 when it is not a valid one. */
QN_EXPORT qn_int32_t tr_close_query_1(tr_query_handle_t handle);

/* Gives the process that last started the file; once a start record has been overwritten, the process that wrote that
 * one. Returns 0 or 37. */
QN_EXPORT qn_int32_t tr_query_pid_1(tr_query_handle_t handle, pid_t *pid_p);

/* Gives the program's name as it was invoked, a copy that the caller frees with free(). Returns 0, 14 or 37. */
QN_EXPORT qn_int32_t tr_query_prog_1(tr_query_handle_t handle, qn_char_t **program_name_p);

/* Gives the platform code of the library that wrote the file; 2 is Linux. Returns 0 or 37. */
QN_EXPORT qn_int32_t tr_query_platform_1(tr_query_handle_t handle, qn_uint32_t *platform_p);

QN_END_DECLS

#endif /* QN_TR_H */
