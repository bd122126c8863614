// Level, file map and file size specifications: their nodes, parsers and application.
//
// The lists hang on the default anchor. Global mutex, held by every caller.
#pragma once

#include "trace/components/component.h"
#include "trace/files/anchor.h"

// One element of a level specification; one block with its two strings.
struct trace_level_spec {
    trace_level_spec_t *pNext;
    trace_level_spec_t *pPrev;
    char *pCompId;          // component pattern
    char *pCategory;        // category pattern
    qn_int32_t detailLevel; // -1: each category's default level
};

// One element of a file map; one block with its two patterns.
struct trace_map_spec {
    trace_map_spec_t *pNext;
    trace_map_spec_t *pPrev;
    char *pCompId;
    char *pCategory;
    trace_anchor_t *anchor_p; // not set by the parser: the file is looked up each time the node is applied
    char fileName[trace_file_name_bytes];
    bool matched;    // with every component that there is; one that registers is matched with all elements
    bool lacks_file; // memory ran out for it when the node was applied last: its categories have the default file
};

// Appends the elements of a level specification to a list; on an error the list is as before.
int parse_trace_spec(const char *pString, trace_level_spec_t **pFirstTraceSpec, trace_level_spec_t **pLastTraceSpec);

// What a list was like before a parse, and giving up what the parse appended.
typedef struct cancel_parse_trace_spec_data {
    trace_level_spec_t **ppFirst;
    trace_level_spec_t **ppLast;
    trace_level_spec_t *pLast; // null: the list was empty
} cancel_parse_trace_spec_data_t;

void cancel_parse_trace_spec(void *pArg);

// Applies one element to all components of the anchor's list, or to pTgtComp alone. Returns 0.
int process_trace_spec(trace_anchor_t *pAnchor, trace_level_spec_t *pTraceSpec, component_anchor_t *pTgtComp);

// The same two for a file map.
int parse_map_spec(const char *pString, trace_map_spec_t **pFirstMapSpec, trace_map_spec_t **pLastMapSpec);
int process_map_spec(trace_anchor_t *pAnchor, trace_map_spec_t *pMapSpec, component_anchor_t *pTgtComp);

namespace qn::tr
{
// 0, or 14 after recording it when memory ran out for a file of the map. The next call looks that one up again.
qn_int32_t check_mapped_files();
} // namespace qn::tr

// Reads one file name, quoted or not, and the separators behind it; where the text goes on.
const char *parseFileName(const char *source, const char *lastPos, char *fileName, int len);

// Appends the node of one selection for one file.
int tr_set_file_map_chain(const char *fileName, const char *selectString, trace_map_spec_t **pFirstMapSpec,
                          trace_map_spec_t **pLastMapSpec);

// Parses and applies a list of file sizes.
int parse_fileSize_spec(const char *pString);

// Sets the size of a trace file or page set, restarting it when it is started. Takes the anchor set lock.
qn_int32_t tr_set_size_in_anchor(trace_anchor_t *pAnchor, qn_uint32_t newSize);

// The size of a started trace file; of one that is not, the requested size and code 25. Takes the anchor set lock.
qn_int32_t tr_get_size_from_anchor(trace_anchor_t *pAnchor, qn_uint32_t *pSize);
