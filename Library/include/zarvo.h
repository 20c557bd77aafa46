/* SPDX-License-Identifier: MIT */
/*
 * libzarvo: reads and makes archives of the Zarvo engine's formats.
 *
 *     zarvo_error *error = NULL;
 *     zarvo_archive *archive = NULL;
 *     if (zarvo_open_path("game.zarvo", NULL, &archive, &error) != ZARVO_OK) {
 *         fprintf(stderr, "%s\n", zarvo_error_text(error));
 *         zarvo_error_free(error);
 *         return 1;
 *     }
 *     uint64_t index;
 *     if (zarvo_find(archive, "road/of/one.txt", ZARVO_WHOLE, &index, NULL) == ZARVO_OK) {
 *         char piece[4096];
 *         size_t count;
 *         if (zarvo_read(archive, index, 0, piece, sizeof(piece), &count, NULL) == ZARVO_OK) ...
 *     }
 *     zarvo_close(archive);
 *
 * An archive holds one stream of bytes, called the data, and a directory. The data is cut into blocks, which are stored
 * as they are or compressed. Each entry of the directory names a range of the data. All four layouts are opened alike.
 *
 * Threads. Any number of threads may use one archive at once, or call functions that take no handle. A zarvo_stream, a
 * zarvo_patterns, a zarvo_writer and a zarvo_error belong to one thread at a time. Close an archive only when no call
 * is using it and its streams have been freed. After fork(), parent and child may both go on using an archive, if no
 * call was using it at that moment.
 *
 * Errors. A function that can fail returns a zarvo_code. Where its last parameter is a zarvo_error**, that may be NULL,
 * or point to a pointer that is NULL: a failure stores an error there, which the caller frees. Results that a function
 * stores through pointers are unchanged after a failure unless its description says otherwise. A null pointer where an
 * object is needed, and an index past the end, are ZARVO_ERROR_ARGUMENT, never a crash.
 *
 * Structures begin with struct_size, which the caller sets to the size of the structure that it was compiled with (the
 * _INIT macros do); one that is not set is ZARVO_ERROR_ARGUMENT. Later versions of the library add fields at the end,
 * and neither read nor write fields that lie past the caller's struct_size.
 *
 * The process. The library prints nothing, and does not change the process's signals, working directory, locale or
 * environment. When memory is refused whose amount depends on an archive or a caller, that is ZARVO_ERROR_MEMORY; the
 * process ends only when the system refuses a few hundred bytes. Descriptors are opened with O_CLOEXEC. Callbacks must
 * return; they must neither throw nor use longjmp.
 */
#ifndef ZARVO_H
#define ZARVO_H

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define ZARVO_API __attribute__((visibility("default")))

/* As a length: the text ends with a NUL, and the library counts. */
#define ZARVO_WHOLE ((size_t)-1)

/* The library's version, such as "0.2.0". */
ZARVO_API const char* zarvo_version(void);

/* ---- Errors ---------------------------------------------------------------------------------------------------- */

typedef int32_t zarvo_code;
enum {
    ZARVO_OK = 0,
    ZARVO_ERROR_ARGUMENT = 1, /* the call makes no sense: a null pointer, an index past the end, an unknown option */
    ZARVO_ERROR_MEMORY = 2,   /* memory was refused */
    ZARVO_ERROR_SYSTEM = 3,   /* the system, or a source's callback, reports an error: see zarvo_error_errno */
    ZARVO_ERROR_NOT_AN_ARCHIVE = 4, /* no archive, a version that is not known, or a damaged header or directory */
    ZARVO_ERROR_DAMAGED = 5,        /* data can't be decoded, ends too early, or lies outside the archive */
    ZARVO_ERROR_UNSUPPORTED = 6,    /* the data needs a kind of compression that is not known */
    ZARVO_ERROR_LIMIT = 7,          /* a limit that the caller set, or its default, would be exceeded */
    ZARVO_ERROR_CHANGED = 8,        /* the archive's file has changed since it was opened */
    ZARVO_ERROR_NOT_FOUND = 9,      /* no entry has that path */
    ZARVO_ERROR_STOPPED = 10,       /* the progress callback stopped the run */
    ZARVO_ERROR_REFUSED = 11        /* the entry's path is refused, or another entry has its place */
};

typedef struct zarvo_error zarvo_error;

/* The code that the failed function returned. ZARVO_OK for NULL. */
ZARVO_API zarvo_code zarvo_error_code(const zarvo_error* error);

/* The errno of a ZARVO_ERROR_SYSTEM, or 0. */
ZARVO_API int zarvo_error_errno(const zarvo_error* error);

/* What went wrong, without a newline, in English, with the system's reason where there is one: "Permission denied". It
 * does not name the archive. Control characters that came from an archive are not escaped. Never NULL; valid until the
 * error is freed. */
ZARVO_API const char* zarvo_error_text(const zarvo_error* error);

/* Frees an error. NULL is allowed. */
ZARVO_API void zarvo_error_free(zarvo_error* error);

/* ---- Opening --------------------------------------------------------------------------------------------------- */

typedef struct zarvo_archive zarvo_archive;

/* Where the bytes come from when the library does not read them itself. */
typedef struct zarvo_source {
    size_t struct_size;
    void* context;

    /* Reads up to size bytes at offset into buffer. Returns how many were read (fewer than size only at the end), or a
     * negative errno. Called by several threads at once when several use the archive, or a run uses several. */
    int64_t (*read_at)(void* context, void* buffer, size_t size, uint64_t offset);

    /* Stores the number of bytes in *size; called once, when the archive is opened. Returns 0 or a negative errno. */
    int (*get_size)(void* context, uint64_t* size);

    /* Called when the archive is closed, or could not be opened. May be NULL. */
    void (*close)(void* context);
} zarvo_source;
#define ZARVO_SOURCE_INIT                                                                                              \
    { sizeof(zarvo_source), NULL, NULL, NULL, NULL }

/* A zero, or NULL, asks for the default. */
typedef struct zarvo_open_options {
    size_t struct_size;

    /* Where the archive begins: the first byte of the file, memory or source that belongs to it. Default: 0. */
    uint64_t offset;

    /* Limits. An archive that exceeds one is ZARVO_ERROR_LIMIT, with a text that says what was exceeded. */
    uint64_t max_entries;         /* entries of the directory. Default: 2^26 */
    uint64_t max_directory_bytes; /* the directory and the list of blocks, decoded. Default: 2^30 */
    uint64_t max_block_bytes; /* decoded bytes of one block held in memory. Blocks that can be decoded piece by piece
                                 (LZMA) or are stored as they are may be larger. Default: 2^31 */

    /* How many bytes decoded blocks, and the states of decoders of streamed blocks, may take while no call uses them.
     * Blocks in use are not counted, and the block that was used last is always kept. Default: 2^23 */
    uint64_t cache_bytes;

    /* Receives remarks about an archive that are not a call's error, such as "Decompressing this format (7) is not
     * supported on this platform.": one line without a newline, and each only once per archive. Called on the thread
     * whose call made the remark, before that call returns, with no lock held; the functions that open an archive call
     * it, too. Default: remarks are dropped. */
    void (*log)(void* log_context, const char* message);
    void* log_context;
} zarvo_open_options;
#define ZARVO_OPEN_OPTIONS_INIT                                                                                        \
    { sizeof(zarvo_open_options), 0, 0, 0, 0, 0, NULL, NULL }

/* These functions open an archive, and read its header and directory. options may be NULL. The caller closes *archive
 * with zarvo_close.
 *
 * path: of any length. The file must be seekable: pipes, sockets and terminals are refused, without waiting for the
 * other end of a pipe. */
ZARVO_API zarvo_code zarvo_open_path(const char* path, const zarvo_open_options* options, zarvo_archive** archive,
                                     zarvo_error** error);

/* descriptor: still belongs to the caller, who may close it once this returns. Its position is not used or changed. */
ZARVO_API zarvo_code zarvo_open_descriptor(int descriptor, const zarvo_open_options* options, zarvo_archive** archive,
                                           zarvo_error** error);

/* data: must stay unchanged, and allocated, until the archive is closed. */
ZARVO_API zarvo_code zarvo_open_memory(const void* data, size_t size, const zarvo_open_options* options,
                                       zarvo_archive** archive, zarvo_error** error);

/* source: copied. Its context must stay valid until its close callback is called, which happens after a failure, too. A
 * wrong size, or reads that deliver different bytes each time, lead to errors or wrong bytes and to nothing worse. */
ZARVO_API zarvo_code zarvo_open_source(const zarvo_source* source, const zarvo_open_options* options,
                                       zarvo_archive** archive, zarvo_error** error);

/* Closes an archive. Texts that it handed out are no longer valid. NULL is allowed. */
ZARVO_API void zarvo_close(zarvo_archive* archive);

/* ---- What an archive is ---------------------------------------------------------------------------------------- */

enum {
    ZARVO_LAYOUT_FS = 0,     /* "ZarvoFS", block-based, whatever its signature */
    ZARVO_LAYOUT_WEB = 1,    /* "ZarvoWeb", one LZMA stream */
    ZARVO_LAYOUT_RAW = 2,    /* "ZarvoRaw", stored as is */
    ZARVO_LAYOUT_ARCHIVE = 3 /* "ZarvoArchive" */
};

typedef struct zarvo_info {
    size_t struct_size;
    int32_t layout;              /* ZARVO_LAYOUT_... */
    uint32_t version;            /* of the layout */
    const char* engine_version;  /* of the engine that wrote it: any bytes but NUL; valid until the archive is closed */
    const char* engine_revision; /* as above */
    uint64_t recorded_size;      /* of the archive, as its writer recorded it; 0 where it did not */
    uint64_t file_size;          /* of the file, memory or source, from offset on */
    uint64_t data_size;          /* of the data, decoded: the sum of the blocks' sizes */
    uint64_t stored_size;        /* of the data, as the blocks are stored */
    uint64_t block_count;
    uint64_t largest_block;   /* decoded bytes */
    uint64_t streamed_blocks; /* blocks that can only be decoded from their start on */
    uint64_t blocks_none;     /* blocks by kind: stored as they are */
    uint64_t blocks_lzma;
    uint64_t blocks_lz4;
    uint64_t blocks_lz4hc;
    uint64_t blocks_unknown;
    uint64_t entry_count; /* of the directory: files and folders, also repeated ones */
    uint64_t file_count;
    uint64_t folder_count;
    uint64_t file_bytes; /* sum of the files' sizes, also repeated ones; UINT64_MAX if it would be more */
} zarvo_info;
#define ZARVO_INFO_INIT                                                                                                \
    { sizeof(zarvo_info), 0, 0, NULL, NULL, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0 }

ZARVO_API zarvo_code zarvo_get_info(const zarvo_archive* archive, zarvo_info* info);

/* ---- Entries --------------------------------------------------------------------------------------------------- */

enum { ZARVO_FILE = 0, ZARVO_FOLDER = 1 };

/* Why extraction refuses an entry. */
enum {
    ZARVO_PROBLEM_NONE = 0,
    ZARVO_PROBLEM_PARENT = 1,   /* a component of the path is ".." */
    ZARVO_PROBLEM_EMPTY = 2,    /* nothing is left of the path in its normal form */
    ZARVO_PROBLEM_SEPARATOR = 3 /* the path of a file ends with a separator */
};

typedef struct zarvo_entry {
    size_t struct_size;
    const char* path;   /* as stored: any bytes but NUL, NUL-terminated, valid until the archive is closed */
    size_t path_length; /* bytes */
    int32_t kind;       /* ZARVO_FILE or ZARVO_FOLDER */
    int32_t problem;    /* ZARVO_PROBLEM_... */
    uint64_t size;      /* bytes of the file; of a folder, whatever is stored */
    uint64_t offset;    /* of the first byte in the data; of a folder, whatever is stored */
    uint32_t flags;     /* as stored */
} zarvo_entry;
#define ZARVO_ENTRY_INIT                                                                                               \
    { sizeof(zarvo_entry), NULL, 0, 0, 0, 0, 0, 0 }

/* The number of entries, which have the indices from 0 on, in the archive's order. 0 for NULL. */
ZARVO_API uint64_t zarvo_entry_count(const zarvo_archive* archive);

ZARVO_API zarvo_code zarvo_get_entry(const zarvo_archive* archive, uint64_t index, zarvo_entry* entry);

/* A path has one normal form: "\" becomes "/", and empty and "." components are dropped. Paths with the same normal
 * form are the same file on disk; of several entries with the same one, the last counts (see zarvo_find). Writes the
 * normal form to out, with a NUL after it, and returns its length. out has room for length + 1 bytes, and may be path
 * itself. */
ZARVO_API size_t zarvo_normalize_path(const char* path, size_t length, char* out);

/* Items are what a folder can hold: the entries, and folders that have no entry but are implied by a path, such as
 * "road" by "road/of/one.txt". Entries keep their indices; implied folders have the numbers from zarvo_entry_count on.
 * Items are linked into a tree by their normal forms. An entry that zarvo_find does not find, because another one has
 * its path or it has a problem, is in no folder. A file has children when entries lie below its path. The first call
 * that needs the tree builds it. */
#define ZARVO_ROOT UINT64_MAX
#define ZARVO_NO_ITEM (UINT64_MAX - 1)

typedef struct zarvo_item {
    size_t struct_size;
    const char* name;      /* last component: not NUL-terminated, valid until the archive is closed */
    size_t name_length;    /* bytes; 0 for ZARVO_ROOT */
    int32_t kind;          /* ZARVO_FILE or ZARVO_FOLDER */
    int32_t is_implied;    /* 1: no entry of its own */
    uint64_t first_child;  /* the first item in this one, in the archive's order, or ZARVO_NO_ITEM */
    uint64_t next_sibling; /* the next item in the same folder, or ZARVO_NO_ITEM */
    size_t path_length;    /* of the normal form, in bytes */
} zarvo_item;
#define ZARVO_ITEM_INIT                                                                                                \
    { sizeof(zarvo_item), NULL, 0, 0, 0, 0, 0, 0 }

/* Finds the item with the same normal form as path: the last such entry (of files and folders, the last file), an
 * implied folder, or ZARVO_ROOT for a path whose normal form is empty. ZARVO_ERROR_NOT_FOUND when there is no such
 * item. */
ZARVO_API zarvo_code zarvo_find(const zarvo_archive* archive, const char* path, size_t length, uint64_t* item,
                                zarvo_error** error);

/* item: an index of an entry, of an implied folder, or ZARVO_ROOT. */
ZARVO_API zarvo_code zarvo_get_item(const zarvo_archive* archive, uint64_t item, zarvo_item* out, zarvo_error** error);

/* Writes an item's normal form, NUL-terminated, to out, which has room for its path_length + 1 bytes. */
ZARVO_API zarvo_code zarvo_get_item_path(const zarvo_archive* archive, uint64_t item, char* out, zarvo_error** error);

/* Entries and implied folders together. 0 if the tree can't be built. */
ZARVO_API uint64_t zarvo_item_count(const zarvo_archive* archive);

/* ---- Reading --------------------------------------------------------------------------------------------------- */

/* Reads up to size bytes of an entry into buffer, starting at byte offset of the entry, and stores in *count how many
 * were read: fewer than size only at the entry's end, 0 past it, and always 0 for a folder. After a failure *count says
 * how many bytes before the damage are in the buffer; it is 0 when the arguments were refused. Compressed blocks
 * of which only a part is read are kept in the archive's cache. */
ZARVO_API zarvo_code zarvo_read(zarvo_archive* archive, uint64_t index, uint64_t offset, void* buffer, size_t size,
                                size_t* count, zarvo_error** error);

/* Stores in *readable how many bytes from an entry's start can be read: its size, unless the archive is damaged.
 * Decodes those blocks of the entry that are not in the cache. A byte can't be read when decoding fails at it, or at a
 * byte before it in the same block. A damaged entry is ZARVO_OK, too. */
ZARVO_API zarvo_code zarvo_get_readable(zarvo_archive* archive, uint64_t index, uint64_t* readable,
                                        zarvo_error** error);

/* Reads a file from its start on. Each read goes on where the last one ended. Reading on inside a large streamed block
 * never decodes it from its start again, however many streams are open. Free a stream before its archive is closed.
 */
typedef struct zarvo_stream zarvo_stream;

ZARVO_API zarvo_code zarvo_stream_open(zarvo_archive* archive, uint64_t index, zarvo_stream** stream,
                                       zarvo_error** error);

/* As zarvo_read, from the stream's position, which moves by *count. */
ZARVO_API zarvo_code zarvo_stream_read(zarvo_stream* stream, void* buffer, size_t size, size_t* count,
                                       zarvo_error** error);

/* Sets the position, to any value. Going back inside a streamed block may decode the block again from its start. */
ZARVO_API zarvo_code zarvo_stream_seek(zarvo_stream* stream, uint64_t position);

/* NULL is allowed. */
ZARVO_API void zarvo_stream_free(zarvo_stream* stream);

/* ---- Blocks ---------------------------------------------------------------------------------------------------- */

/* For tools that work block by block. Archives may hold other values, too. */
enum {
    ZARVO_KIND_NONE = 0, /* stored as is */
    ZARVO_KIND_LZMA = 1,
    ZARVO_KIND_LZ4 = 2,
    ZARVO_KIND_LZ4HC = 3
};

typedef struct zarvo_block {
    size_t struct_size;
    uint64_t position;    /* in the data */
    uint32_t size;        /* decoded bytes */
    uint32_t stored_size; /* in the archive, as recorded */
    int32_t kind;         /* ZARVO_KIND_..., or another value up to 63 */
    int32_t is_streamed;  /* 1: it can only be decoded from its start on, as one stream */
} zarvo_block;
#define ZARVO_BLOCK_INIT                                                                                               \
    { sizeof(zarvo_block), 0, 0, 0, 0, 0 }

ZARVO_API uint64_t zarvo_block_count(const zarvo_archive* archive);
ZARVO_API zarvo_code zarvo_get_block(const zarvo_archive* archive, uint64_t index, zarvo_block* block);

/* Decodes a whole block into buffer, which has room for the block's size (and may be NULL if that is 0), and stores in
 * *count how many bytes were delivered: all, or after a failure those before the damage. The cache does not keep it. */
ZARVO_API zarvo_code zarvo_read_block(zarvo_archive* archive, uint64_t index, void* buffer, size_t* count,
                                      zarvo_error** error);

/* ---- Patterns -------------------------------------------------------------------------------------------------- */

/* Paths and globs that choose entries. A glob must match the whole path, or that of a folder above it, even an implied
 * one: a pattern that matches a folder chooses everything below it. "*" (any characters), "?" (one character) and
 * "[...]" (one of a set) match leading dots, but never "/". "**" matches anything ("**" + "/x" also a top-level "x").
 * "\" makes the next character stand for itself. A leading or trailing "/" and a leading "./" change nothing; an empty
 * pattern and "/" match everything. A pattern also matches the path that equals it. An entry is chosen when any
 * pattern matches it. */
typedef struct zarvo_patterns zarvo_patterns;

ZARVO_API zarvo_code zarvo_patterns_new(zarvo_patterns** patterns, zarvo_error** error);
ZARVO_API zarvo_code zarvo_patterns_add(zarvo_patterns* patterns, const char* pattern, size_t length,
                                        zarvo_error** error);

/* Whether any pattern matches a path, as it is stored or in its normal form: 1 or 0, or -1 when memory is refused. All
 * patterns that match are remembered as used. */
ZARVO_API int zarvo_patterns_match(zarvo_patterns* patterns, const char* path, size_t length);

/* Whether pattern number index, in the order of adding, has matched a path so far: 1 or 0. */
ZARVO_API int zarvo_patterns_used(const zarvo_patterns* patterns, size_t index);

/* NULL is allowed. */
ZARVO_API void zarvo_patterns_free(zarvo_patterns* patterns);

/* ---- Working on a whole archive ---------------------------------------------------------------------------------- */

/* How far a run has come. */
typedef struct zarvo_progress {
    size_t struct_size;
    uint64_t bytes;       /* bytes of data that the run has finished with */
    uint64_t bytes_total; /* bytes of data when the run is complete */
    uint64_t files;       /* entries that have a result */
    uint64_t files_total; /* entries that will have one; while zarvo_create looks for them, those that it has found */
} zarvo_progress;

/* What all runs have in common: zarvo_extract, zarvo_test, zarvo_visit and those that make archives. A zero, or NULL,
 * asks for the default. The callbacks are called on the calling thread unless they say otherwise, with no lock held. */
typedef struct zarvo_run_options {
    size_t struct_size;

    uint32_t threads; /* at most. Default: one per processor that the process may use. Results never depend on it */
    uint64_t memory;  /* bytes that blocks may take while they are decoded, each twice its size. If there is too little
                         for all threads, fewer work; if for one block, its entries fail with ZARVO_ERROR_LIMIT.
                         Default: half of the machine's free memory */

    zarvo_patterns* wanted;   /* which entries to take. Default: all. Must not be used elsewhere during the call */
    zarvo_patterns* excluded; /* which of them to leave out. Default: none. As above */

    /* Called ten times a second, and at the end. A result other than 0 stops the run with ZARVO_ERROR_STOPPED. At the
       end, when all else is done, that goes only for runs that make an archive. */
    int (*progress)(void* context, const zarvo_progress* progress);
    void* context; /* for all callbacks of the run */
} zarvo_run_options;
#define ZARVO_RUN_OPTIONS_INIT                                                                                         \
    { sizeof(zarvo_run_options), 0, 0, NULL, NULL, NULL, NULL }

/* What became of an entry. */
enum {
    ZARVO_OUTCOME_DONE = 0,    /* put in place */
    ZARVO_OUTCOME_KEPT = 1,    /* what was there was left (ZARVO_OVERWRITE_NEVER) */
    ZARVO_OUTCOME_FAILED = 2,  /* see code and text */
    ZARVO_OUTCOME_BROKEN = 3,  /* failed, but the bytes before the damage were put in place (keep_broken) */
    ZARVO_OUTCOME_LEFT_OUT = 4 /* not put into the archive that is made; see text */
};
typedef struct zarvo_report {
    size_t struct_size;
    uint64_t index;   /* of the entry */
    int32_t outcome;  /* ZARVO_OUTCOME_... */
    zarvo_code code;  /* of a failure, else ZARVO_OK */
    int system_code;  /* an errno, or 0 */
    const char* text; /* as zarvo_error_text; valid until the callback returns */
} zarvo_report;

enum {
    ZARVO_OVERWRITE_ALWAYS = 0, /* a file that is there is replaced */
    ZARVO_OVERWRITE_NEVER = 1,  /* it is left; data that only such files need is not read */
    ZARVO_OVERWRITE_FAIL = 2    /* it is left, and that is a failure of the entry */
};

typedef struct zarvo_extract_options {
    size_t struct_size;
    int32_t overwrite;   /* ZARVO_OVERWRITE_... */
    int32_t keep_broken; /* 1: the bytes of a damaged file before the damage are put in place, too */
    int32_t dry_run;     /* 1: nothing is written, and nothing is made; all is read and decoded, and reported as without
                            it, as far as can be known without writing */
    uint64_t strip;      /* how many leading components each path loses; entries that have no more are left out */
    uint64_t max_bytes;  /* of all files together: if they have more, ZARVO_ERROR_LIMIT, and nothing is written.
                            Default: no limit */

    /* Called once for each wanted entry that no later one replaces, in the archive's order. May be NULL. */
    void (*report)(void* context, const zarvo_report* report);
} zarvo_extract_options;
#define ZARVO_EXTRACT_OPTIONS_INIT                                                                                     \
    { sizeof(zarvo_extract_options), 0, 0, 0, 0, 0, NULL }

/* What a run has done. */
typedef struct zarvo_summary {
    size_t struct_size;
    uint64_t files;    /* put in place (zarvo_test: checked) */
    uint64_t folders;  /* entries that are folders, put in place */
    uint64_t kept;     /* left as they were */
    uint64_t failures; /* entries that failed, also broken ones, and those that were not reached when the call itself
                          failed, but for ZARVO_ERROR_STOPPED (zarvo_test: entries with unreadable bytes) */
    uint64_t bytes;    /* of these files */
    uint64_t damaged_blocks;
    uint64_t archive_bytes; /* of the archive that was made */
} zarvo_summary;
#define ZARVO_SUMMARY_INIT                                                                                             \
    { sizeof(zarvo_summary), 0, 0, 0, 0, 0, 0, 0 }

/* Writes entries below folder, which is made if it is missing, with the folders above it. Nothing is written elsewhere:
 * links below it are not followed, and paths with ".." are refused. A new file gets its name only when it is whole, and
 * replaces what is there in one step; links, devices, pipes and sockets in its place are never opened. When two entries
 * exclude each other (one is a file where the other needs a folder), the first in the archive is written and the other
 * fails. Of several entries with the same path, the last is written.
 *
 * options, how and summary may be NULL. *summary is filled after a failure, too. Entries that fail do not fail the
 * call: see the summary. A disk that is full or can't be written ends the run with ZARVO_ERROR_SYSTEM.
 *
 * A program whose file sizes are limited (ulimit -f) should ignore SIGXFSZ, to get an error instead of a signal. */
ZARVO_API zarvo_code zarvo_extract(zarvo_archive* archive, const char* folder, const zarvo_run_options* options,
                                   const zarvo_extract_options* how, zarvo_summary* summary, zarvo_error** error);

typedef struct zarvo_test_options {
    size_t struct_size;

    /* Called for each block that can't be decoded, in the blocks' order, after all have been tried. May be NULL. */
    void (*block)(void* context, uint64_t block_index, const char* text);

    /* Called for each entry with bytes that can't be read, in the archive's order. readable: how many bytes before them
     * can be read. May be NULL. */
    void (*entry)(void* context, uint64_t index, uint64_t readable);
} zarvo_test_options;
#define ZARVO_TEST_OPTIONS_INIT                                                                                        \
    { sizeof(zarvo_test_options), NULL, NULL }

/* Decodes every block once, and writes nothing. The formats hold no checksums, so damage that still decodes is not
 * found. Patterns are not used. After a failure, *summary is empty. Otherwise as zarvo_extract. */
ZARVO_API zarvo_code zarvo_test(zarvo_archive* archive, const zarvo_run_options* options,
                                const zarvo_test_options* what, zarvo_summary* summary, zarvo_error** error);

typedef struct zarvo_visit_options {
    size_t struct_size;
    uint64_t strip; /* as in zarvo_extract_options: paths may become the same by it, and then the last entry counts */

    /* Called with the bytes of the files that extraction would write, piece by piece: those of each file in order, from
     * offset 0 on, and none after damage. Several threads call it at once, for different files. It must not use the
     * run's patterns. Not called for empty files. */
    void (*bytes)(void* context, uint64_t index, uint64_t offset, const void* bytes, size_t size);

    /* Called once for each entry that extraction would report, in the archive's order, and for a file after all its
     * bytes. May be NULL. */
    void (*report)(void* context, const zarvo_report* report);
} zarvo_visit_options;
#define ZARVO_VISIT_OPTIONS_INIT                                                                                       \
    { sizeof(zarvo_visit_options), 0, NULL, NULL }

/* Hands the bytes of files to a callback, and decodes each block once. Otherwise as zarvo_extract. */
ZARVO_API zarvo_code zarvo_visit(zarvo_archive* archive, const zarvo_run_options* options,
                                 const zarvo_visit_options* what, zarvo_summary* summary, zarvo_error** error);

/* ---- Making archives ------------------------------------------------------------------------------------------- */

#define ZARVO_DEFAULT (-1)

/* What became of a file or folder that was to be put into an archive. */
typedef struct zarvo_create_report {
    size_t struct_size;
    const char* path;   /* in the archive: NUL-terminated, valid until the callback returns. Empty: the folder itself */
    size_t path_length; /* bytes */
    int32_t kind;       /* ZARVO_FILE or ZARVO_FOLDER */
    int32_t outcome;    /* ZARVO_OUTCOME_DONE, _LEFT_OUT, or _FAILED: no archive is made, for the reason in text */
    zarvo_code code;    /* of a failure, else ZARVO_OK */
    int system_code;    /* an errno, or 0 */
    const char* text;   /* as zarvo_error_text; valid until the callback returns */
} zarvo_create_report;

/* What an archive is to be like. A zero, or NULL, asks for the default, except where ZARVO_DEFAULT does. What the
 * layout gives no choice of has to be the default. */
typedef struct zarvo_create_options {
    size_t struct_size;
    int32_t layout;      /* ZARVO_LAYOUT_... Default: ZARVO_LAYOUT_FS */
    int32_t compression; /* ZARVO_KIND_... of the blocks. ZARVO_DEFAULT: LZ4HC, or LZMA if is_streamed is set. No choice
                            in ZARVO_LAYOUT_WEB (one LZMA stream) and ZARVO_LAYOUT_RAW (stored as is). A block that does
                            not shrink is stored as it is */
    int32_t level;       /* of the coder: 1 to 12 for LZ4HC, 0 to 9 for LZMA. ZARVO_DEFAULT: 9 and 5. The others have no
                            levels. The bytes of an archive depend on the version of the coder, too */
    int32_t is_streamed; /* 1: blocks can only be decoded from their start on. Not with LZ4 and LZ4HC. No choice in
                            ZARVO_LAYOUT_WEB and ZARVO_LAYOUT_RAW */
    uint64_t block_size; /* decoded bytes, 4,096 to 2^30. Default: 131,072. No choice in ZARVO_LAYOUT_WEB and
                            ZARVO_LAYOUT_RAW */
    const char* engine_version;  /* that the archive says it is for. Default: "5.x.x" */
    const char* engine_revision; /* Default: "7041.3.0b12" */
    int32_t force;   /* 1: replace a file, or a link, that has the archive's name. Devices, pipes and sockets
                        are never replaced */
    int32_t dry_run; /* 1: nothing is written, and only folders are read; what fails without it fails, too,
                        as far as can be known without writing and without reading files */

    /* Called for each file or folder that is left out or fails, and if the run succeeds, at its end for each that was
     * put into the archive, in the archive's order. May be NULL. */
    void (*report)(void* context, const zarvo_create_report* report);

    /* Receives remarks that are not an error: a line without a newline. May be NULL. */
    void (*log)(void* context, const char* message);
} zarvo_create_options;
#define ZARVO_CREATE_OPTIONS_INIT                                                                                      \
    { sizeof(zarvo_create_options), 0, ZARVO_DEFAULT, ZARVO_DEFAULT, 0, 0, NULL, NULL, 0, 0, NULL, NULL }

/* Makes an archive of what lies below a folder. The entries are sorted by the bytes of their paths, so the same files
 * and options give the same bytes, for any number of threads. Hard links become files of their own. Links, devices,
 * pipes and sockets are left out, and so are folders where the layout has none: a folder that holds files is left out
 * without a report. The archive itself is never put into it.
 *
 * path: where the archive goes. It is written beside that, to a file named ".NAME.zarvo-part", and gets its name when
 * it is whole and on the disk. What was there is kept unless how says force: then ZARVO_ERROR_SYSTEM with EEXIST.
 *
 * options, how and summary may be NULL; options may not have wanted patterns. Each thread takes twice the size of a
 * block and the memory of its coder, which for LZMA is about 12 times the dictionary. A file that changes its size,
 * vanishes or can't be read, and whatever the layout can't hold, is an error of its entry, and no archive is made.
 * summary counts what was left out as failures. */
ZARVO_API zarvo_code zarvo_create(const char* path, const char* folder, const zarvo_run_options* options,
                                  const zarvo_create_options* how, zarvo_summary* summary, zarvo_error** error);

/* Collects entries from memory and callbacks, and makes an archive of them. The order of adding does not matter. */
typedef struct zarvo_writer zarvo_writer;

ZARVO_API zarvo_code zarvo_writer_new(zarvo_writer** writer, zarvo_error** error);

/* These functions add an entry. path: components separated by "/", none of them empty, "." or "..", and without "\\".
 * ZARVO_ERROR_REFUSED if it is anything else.
 *
 * data: must stay unchanged, and allocated, until the writer is freed. */
ZARVO_API zarvo_code zarvo_writer_add_memory(zarvo_writer* writer, const char* path, size_t length, const void* data,
                                             size_t size, zarvo_error** error);

/* source: copied. Its size is asked for at once, its bytes while an archive is made. Closed when the writer is freed,
 * or the entry could not be added. */
ZARVO_API zarvo_code zarvo_writer_add_source(zarvo_writer* writer, const char* path, size_t length,
                                             const zarvo_source* source, zarvo_error** error);

ZARVO_API zarvo_code zarvo_writer_add_folder(zarvo_writer* writer, const char* path, size_t length,
                                             zarvo_error** error);

/* As zarvo_create, of the entries that were added. Two entries with the same path, and a file in the place of a folder,
 * are ZARVO_ERROR_REFUSED. Patterns are not used. May be called again. */
ZARVO_API zarvo_code zarvo_writer_write(zarvo_writer* writer, const char* path, const zarvo_run_options* options,
                                        const zarvo_create_options* how, zarvo_summary* summary, zarvo_error** error);

/* NULL is allowed. */
ZARVO_API void zarvo_writer_free(zarvo_writer* writer);

#ifdef __cplusplus
}
#endif

#endif
