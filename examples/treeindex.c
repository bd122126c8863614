/*
 * treeindex - counts the lines, words and identifiers of a directory tree, and traces what it does.
 *
 * Several threads share a queue of directories. Each takes one, queues the directories in it, and reads the files in
 * it. An ordinary client of the tracing library: it includes <qn_tr.h> alone, registers two components, and asks at
 * every trace point whether the record is wanted.
 *
 *   treeindex [-t trace-file] [-s trace-bytes] [-n names-file] [-j threads] [-r rounds] [folder ...]
 *
 * With -n, the names of the files that it reads go to a trace file of their own. What else is traced, and in how much
 * detail, is steered from outside: QN_TR_TRACE_LEVELS='WALK:Queue=1,INDX:Content' adds the queue and file summaries.
 */
#include <ctype.h>
#include <dirent.h>
#include <errno.h>
#include <pthread.h>
#include <stdatomic.h>
#include <stdbool.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <qn_tr.h>

/* ---- what is traced: two components, four categories each ---- */

enum { WALK_ERRORS, WALK_FOLDERS, WALK_NAMES, WALK_QUEUE };
enum { INDX_ERRORS, INDX_FILES, INDX_NAMES, INDX_CONTENT };

static const tr_category_description_t walk_categories[] = {
    {WALK_ERRORS, "Errors", 1, 1},
    {WALK_FOLDERS, "Folders", 1, 1},
    {WALK_NAMES, "Names", 2, 1},
    {WALK_QUEUE, "Queue", 2, 0},
};
static const tr_category_description_t indx_categories[] = {
    {INDX_ERRORS, "Errors", 1, 1},
    {INDX_FILES, "Files", 1, 1},
    {INDX_NAMES, "Names", 1, 1},
    {INDX_CONTENT, "Content", 2, 1},
};
static tr_detail_level_t walk_levels[4];
static tr_detail_level_t indx_levels[4];
static tr_file_token_t *indx_files; /* per category, the trace file that it goes to */

/* Trace points, by number: what the reader of a trace sees as "id". */
enum {
    FOLDER_ENTERED = 100,
    FOLDER_NAME,
    FOLDER_UNREADABLE,
    QUEUE_LENGTH,
    FILE_READ = 200,
    FILE_NAME,
    FILE_BYTES,
    FILE_SUMMARY,
    FILE_UNREADABLE
};

/* Records written, so that whoever reads the trace may count them again. */
static atomic_ulong records;

/* A trace point: one byte is tested, and the call is made when the record is wanted. */
#define TRACE(levels, category, level, call) QN_TR_IF(levels, category, level, (atomic_fetch_add(&records, 1), (call)))

/* An error goes into the error record of this thread first, and from there into the trace. */
static void trace_unreadable(const char *component, qn_uint32_t id, const char *name, int error, qn_uint32_t line)
{
    cu_set_error_1(error, NULL, "treeindex.cat", 1, 1, "Cannot read \"%s\": error %d.\n", name, error);
    tr_record_error_1(component, id, "treeindex", line, __FILE__, NULL);
}

/* ---- counting ---- */

enum { WORD_BYTES = 48, WORDS = 1 << 16 };

struct word {
    char text[WORD_BYTES];
    unsigned long count;
};

struct index {
    unsigned long files, unreadable, lines, words, bytes;
    struct word *table; /* open addressing; WORDS entries; what finds no place is not counted */
};

static void count_word(struct index *index, const char *text, size_t length, unsigned long count)
{
    if (length >= WORD_BYTES) length = WORD_BYTES - 1;
    unsigned long hash = 5381;
    for (size_t i = 0; i < length; ++i) hash = hash * 33 + (unsigned char)text[i];
    for (size_t probe = 0; probe < 64; ++probe) {
        struct word *word = &index->table[(hash + probe) % WORDS];
        if (word->count == 0) memcpy(word->text, text, length); /* the rest of it is zero */
        if (strlen(word->text) != length || memcmp(word->text, text, length) != 0) continue;
        word->count += count;
        return;
    }
}

static void count_text(struct index *index, const char *text, size_t bytes)
{
    const char *start = NULL; /* of the identifier being read */
    for (size_t i = 0; i <= bytes; ++i) {
        const unsigned char c = i < bytes ? (unsigned char)text[i] : ' ';
        if (isalpha(c) || c == '_' || (start != NULL && isdigit(c))) {
            if (start == NULL) start = text + i;
            continue;
        }
        if (c == '\n') ++index->lines;
        if (start == NULL) continue;
        ++index->words;
        count_word(index, start, (size_t)(text + i - start), 1);
        start = NULL;
    }
}

static void read_file(struct index *index, const char *name)
{
    static _Thread_local char buffer[1 << 16];
    FILE *file = fopen(name, "re");
    if (file == NULL) {
        ++index->unreadable;
        TRACE(indx_levels, INDX_ERRORS, 1, trace_unreadable("INDX", FILE_UNREADABLE, name, errno, __LINE__));
        return;
    }
    const unsigned long lines = index->lines;
    const unsigned long words = index->words;
    unsigned long bytes = 0;
    size_t got = 0;
    while ((got = fread(buffer, 1, sizeof buffer, file)) > 0) {
        if (bytes == 0)
            TRACE(indx_levels, INDX_CONTENT, 1,
                  tr_record_data_1("INDX", FILE_BYTES, 1, (const void *)buffer, (int)(got < 32 ? got : 32)));
        bytes += got;
        count_text(index, buffer, got);
    }
    fclose(file);
    ++index->files;
    index->bytes += bytes;
    TRACE(indx_levels, INDX_FILES, 1,
          tr_record_values_64_1("INDX", FILE_READ, 3, (qn_int64_t)bytes, (qn_int64_t)(index->lines - lines),
                                (qn_int64_t)(index->words - words)));
    TRACE(indx_levels, INDX_NAMES, 1, tr_ms_record_strings_1("INDX", FILE_NAME, indx_files[INDX_NAMES], 1, name));
    TRACE(indx_levels, INDX_CONTENT, 2,
          tr_record_fmt_string_1("INDX", FILE_SUMMARY, "%s: %lu bytes, %lu lines", name, bytes, index->lines - lines));
}

/* ---- walking ---- */

struct folder {
    struct folder *next;
    char name[];
};

/* Folders still to be read; `busy` threads may add more. Guarded by lock. */
static struct {
    pthread_mutex_t lock;
    pthread_cond_t changed;
    struct folder *first;
    int length;
    int busy;
} queue = {.lock = PTHREAD_MUTEX_INITIALIZER, .changed = PTHREAD_COND_INITIALIZER};

static void put_folder(const char *name)
{
    const size_t bytes = strlen(name) + 1;
    struct folder *folder = malloc(sizeof *folder + bytes);
    if (folder == NULL) return;
    memcpy(folder->name, name, bytes);
    pthread_mutex_lock(&queue.lock);
    folder->next = queue.first;
    queue.first = folder;
    const int length = ++queue.length;
    pthread_cond_signal(&queue.changed);
    pthread_mutex_unlock(&queue.lock);
    TRACE(walk_levels, WALK_QUEUE, 1, tr_record_int32_1("WALK", QUEUE_LENGTH, length));
}

/* The next folder; NULL when there are none and no thread can add any. */
static struct folder *take_folder(bool was_busy)
{
    pthread_mutex_lock(&queue.lock);
    if (was_busy && --queue.busy == 0) pthread_cond_broadcast(&queue.changed);
    while (queue.first == NULL && queue.busy > 0) pthread_cond_wait(&queue.changed, &queue.lock);
    struct folder *folder = queue.first;
    if (folder != NULL) {
        queue.first = folder->next;
        --queue.length;
        ++queue.busy;
    }
    pthread_mutex_unlock(&queue.lock);
    return folder;
}

static void read_folder(struct index *index, const char *folder_name)
{
    TRACE(walk_levels, WALK_FOLDERS, 1, tr_record_id_1("WALK", FOLDER_ENTERED));
    TRACE(walk_levels, WALK_NAMES, 1, tr_record_fmt_string_1("WALK", FOLDER_NAME, "in %s", folder_name));
    DIR *folder = opendir(folder_name);
    if (folder == NULL) {
        ++index->unreadable;
        TRACE(walk_levels, WALK_ERRORS, 1, trace_unreadable("WALK", FOLDER_UNREADABLE, folder_name, errno, __LINE__));
        return;
    }
    const struct dirent *entry = NULL;
    while ((entry = readdir(folder)) != NULL) {
        if (strcmp(entry->d_name, ".") == 0 || strcmp(entry->d_name, "..") == 0) continue;
        char name[4096];
        if (snprintf(name, sizeof name, "%s/%s", folder_name, entry->d_name) >= (int)sizeof name) continue;
        struct stat status;
        if (lstat(name, &status) == 0 && S_ISDIR(status.st_mode))
            put_folder(name);
        else if (!S_ISFIFO(status.st_mode) && !S_ISSOCK(status.st_mode))
            read_file(index, name);
    }
    closedir(folder);
}

static void *index_folders(void *argument)
{
    struct folder *folder = take_folder(false);
    while (folder != NULL) {
        read_folder(argument, folder->name);
        free(folder);
        folder = take_folder(true);
    }
    return NULL;
}

/* ---- the program ---- */

static int by_count(const void *left, const void *right)
{
    const struct word *a = left;
    const struct word *b = right;
    if (a->count != b->count) return a->count < b->count ? 1 : -1;
    return strcmp(a->text, b->text);
}

static void print_index(struct index *parts, int count)
{
    struct index *total = &parts[0];
    for (int i = 1; i < count; ++i) {
        total->files += parts[i].files;
        total->unreadable += parts[i].unreadable;
        total->lines += parts[i].lines;
        total->words += parts[i].words;
        total->bytes += parts[i].bytes;
        for (int w = 0; w < WORDS; ++w)
            if (parts[i].table[w].count > 0)
                count_word(total, parts[i].table[w].text, strlen(parts[i].table[w].text), parts[i].table[w].count);
    }
    printf("%lu files (%lu unreadable), %lu bytes, %lu lines, %lu identifiers; most frequent:\n", total->files,
           total->unreadable, total->bytes, total->lines, total->words);
    qsort(total->table, WORDS, sizeof *total->table, by_count);
    for (int w = 0; w < 5 && total->table[w].count > 0; ++w)
        printf("%10lu  %s\n", total->table[w].count, total->table[w].text);
    printf("%lu records traced\n", (unsigned long)records);
}

static bool run_threads(struct index *parts, int count)
{
    pthread_t threads[64];
    int started = 0;
    while (started < count && pthread_create(&threads[started], NULL, index_folders, &parts[started]) == 0) ++started;
    for (int i = 0; i < started; ++i) pthread_join(threads[i], NULL);
    return started > 0;
}

static bool start_tracing(const char *trace_file, qn_uint32_t trace_bytes, const char *names_file)
{
    if (tr_set_size_1(trace_bytes) != 0 || tr_set_filename_1(trace_file) != 0) return false;
    if (names_file != NULL && tr_set_file_map_1(names_file, "INDX:Names") != 0) return false;
    return tr_register_component_1("WALK", walk_levels, walk_categories, 4) == 0 &&
           tr_ms_register_component_1("INDX", indx_levels, indx_categories, 4, &indx_files) == 0;
}

int main(int argc, char **argv)
{
    const char *trace_file = "treeindex.trc";
    const char *names_file = NULL;
    qn_uint32_t trace_bytes = 1 << 20;
    long rounds = 1;
    int threads = 4;
    int option = 0;
    while ((option = getopt(argc, argv, "t:s:n:j:r:")) != -1) {
        switch (option) {
        case 't': trace_file = optarg; break;
        case 's': trace_bytes = (qn_uint32_t)strtoul(optarg, NULL, 0); break;
        case 'n': names_file = optarg; break;
        case 'j': threads = atoi(optarg); break;
        case 'r': rounds = atol(optarg); break;
        default:
            fprintf(stderr, "usage: treeindex [-t file] [-s bytes] [-n file] [-j threads] [-r rounds] [folder ...]\n");
            return 2;
        }
    }
    if (threads < 1 || threads > 64) threads = 4;

    if (!start_tracing(trace_file, trace_bytes, names_file)) {
        cu_error_t *error = NULL;
        char *text = NULL;
        if (cu_get_error_1(&error) == 0 && cu_get_errmsg_1(error, &text) == 0) fprintf(stderr, "treeindex: %s", text);
        free(text);
        cu_rel_error_1(error);
        return 1;
    }
    struct index parts[64] = {{0}};
    for (int i = 0; i < threads; ++i) {
        parts[i].table = calloc(WORDS, sizeof *parts[i].table);
        if (parts[i].table == NULL) return 1;
    }
    for (long round = 0; round < rounds; ++round) {
        if (optind == argc) put_folder("/usr/include");
        for (int i = optind; i < argc; ++i) put_folder(argv[i]);
        if (!run_threads(parts, threads)) return 1;
    }
    print_index(parts, threads);
    for (int i = 0; i < threads; ++i) free(parts[i].table);
    return 0;
}
