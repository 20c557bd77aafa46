/* Reads every file of an archive in several threads, and prints "checksum  path" in the archive's order:
 * ReadInThreads ARCHIVE */
#include <zarvo.h>

#include <inttypes.h>
#include <pthread.h>
#include <stdatomic.h>
#include <stdio.h>
#include <stdlib.h>

enum { THREADS = 4 };

struct sum {
    uint64_t value; /* FNV-1a */
    zarvo_error* error;
};

struct work {
    zarvo_archive* archive;
    atomic_uint_fast64_t next; /* the entry that no thread has taken yet */
    struct sum* sums;          /* one an entry */
};

static struct sum sum_file(zarvo_archive* archive, uint64_t index) {
    struct sum sum = {UINT64_C(0xcbf29ce484222325), NULL};
    unsigned char piece[65536];
    size_t count = 0;
    uint64_t offset = 0;
    while (zarvo_read(archive, index, offset, piece, sizeof(piece), &count, &sum.error) == ZARVO_OK && count != 0) {
        for (size_t at = 0; at < count; ++at)
            sum.value = (sum.value ^ piece[at]) * UINT64_C(0x100000001b3);
        offset += count;
    }
    return sum;
}

static void* sum_files(void* argument) {
    struct work* const work = argument;
    uint64_t index;
    while ((index = atomic_fetch_add(&work->next, 1)) < zarvo_entry_count(work->archive))
        work->sums[index] = sum_file(work->archive, index);
    return NULL;
}

static int print_sums(const struct work* work) {
    int status = 0;
    for (uint64_t index = 0; index < zarvo_entry_count(work->archive); ++index) {
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        zarvo_get_entry(work->archive, index, &entry);
        zarvo_error* const error = work->sums[index].error;
        if (error != NULL) {
            fprintf(stderr, "%s: %s\n", entry.path, zarvo_error_text(error));
            zarvo_error_free(error);
            status = 1;
        } else if (entry.kind == ZARVO_FILE) {
            printf("%016" PRIx64 "  %s\n", work->sums[index].value, entry.path);
        }
    }
    return fflush(stdout) == 0 && ferror(stdout) == 0 ? status : 1;
}

int main(int argument_count, char** arguments) {
    if (argument_count != 2) {
        fprintf(stderr, "Usage: ReadInThreads ARCHIVE\n");
        return 2;
    }
    struct work work = {NULL, 0, NULL};
    zarvo_error* error = NULL;
    if (zarvo_open_path(arguments[1], NULL, &work.archive, &error) != ZARVO_OK) {
        fprintf(stderr, "%s: %s\n", arguments[1], zarvo_error_text(error));
        zarvo_error_free(error);
        return 1;
    }
    work.sums = calloc(zarvo_entry_count(work.archive) + 1, sizeof(*work.sums));
    if (work.sums == NULL) abort();
    pthread_t threads[THREADS];
    int started = 0;
    while (started < THREADS && pthread_create(&threads[started], NULL, sum_files, &work) == 0)
        ++started;
    sum_files(&work); /* whatever is left */
    for (int thread = 0; thread < started; ++thread)
        pthread_join(threads[thread], NULL);
    const int status = print_sums(&work);
    free(work.sums);
    zarvo_close(work.archive);
    return status;
}
