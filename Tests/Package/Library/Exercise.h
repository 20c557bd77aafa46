/* What each of these programs has the library do, linked or loaded: read a sample whole, and damaged copies of it as
 * far as they go, and make an archive. C and C++; a failed check ends the program with its text. */
#ifndef EXERCISE_H
#define EXERCISE_H

#ifndef _GNU_SOURCE
#define _GNU_SOURCE
#endif

#include <zarvo.h>

#include <dlfcn.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#define CHECK(condition)                                                                                               \
    do {                                                                                                               \
        if (!(condition)) {                                                                                            \
            fprintf(stderr, "%s:%d: %s does not hold\n", __FILE__, __LINE__, #condition);                              \
            exit(1);                                                                                                   \
        }                                                                                                              \
    } while (0)

#define FUNCTIONS(EACH)                                                                                                \
    EACH(open_path)                                                                                                    \
    EACH(open_memory)                                                                                                  \
    EACH(close)                                                                                                        \
    EACH(entry_count)                                                                                                  \
    EACH(find)                                                                                                         \
    EACH(read)                                                                                                         \
    EACH(writer_new)                                                                                                   \
    EACH(writer_add_memory)                                                                                            \
    EACH(writer_write)                                                                                                 \
    EACH(writer_free)                                                                                                  \
    EACH(error_text)                                                                                                   \
    EACH(error_free)

struct Library {
#define POINTER(name) __typeof__(zarvo_##name)* name;
    FUNCTIONS(POINTER)
#undef POINTER
    void* loaded;
};

static inline struct Library Load(void* loaded) {
    struct Library library;
    if (loaded == NULL) fprintf(stderr, "%s\n", dlerror());
    CHECK(loaded != NULL);
    library.loaded = loaded;
#define FIND(name)                                                                                                     \
    *(void**)&library.name = dlsym(loaded, "zarvo_" #name);                                                            \
    CHECK(library.name != NULL);
    FUNCTIONS(FIND)
#undef FIND
    return library;
}

static inline char* SamplePath(const char* samples, int number) {
    static const char* const kNames[] = {"road", "web", "raw", "archive"};
    char* const path = (char*)malloc(strlen(samples) + 32);
    sprintf(path, "%s/%s.zarvo", samples, kNames[number % 4]);
    return path;
}

static inline char* ReadFile(const char* path, size_t* size) {
    char* const bytes = (char*)malloc(1 << 20);
    FILE* const file = fopen(path, "rb");
    CHECK(file != NULL);
    *size = fread(bytes, 1, 1 << 20, file);
    fclose(file);
    return bytes;
}

static inline void CheckTable(const char* bytes, size_t size) {
    size_t position = strlen("number,square\n");
    CHECK(size > position && memcmp(bytes, "number,square\n", position) == 0);
    for (int number = 0; number < 6000; ++number) {
        char line[32];
        const size_t length = (size_t)sprintf(line, "%d,%d\n", number, number * number);
        CHECK(length <= size - position && memcmp(bytes + position, line, length) == 0);
        position += length;
    }
    CHECK(position == size);
}

static inline void CountMessage(void* count, const char* message) {
    CHECK(message[0] != '\0');
    ++*(int*)count;
}

/* How many entries can't be read whole. */
static inline int ReadAll(const struct Library* library, zarvo_archive* archive) {
    int damaged = 0;
    for (uint64_t index = 0; index < library->entry_count(archive); ++index) {
        char piece[10000];
        size_t count = 1;
        zarvo_error* error = NULL;
        for (uint64_t offset = 0; count != 0 && error == NULL; offset += count)
            (void)library->read(archive, index, offset, piece, sizeof(piece), &count, &error);
        if (error != NULL) ++damaged;
        library->error_free(error);
    }
    return damaged;
}

enum { kHeader = 64 };

/* Reads the sample with that number, and copies of it with one spoilt byte each, first those of its header; adds how
 * much the library has to say about them. */
static inline void Exercise(const struct Library* library, const char* samples, int number, int copies, int* messages) {
    char* const path = SamplePath(samples, number);
    zarvo_archive* archive = NULL;
    zarvo_error* error = NULL;
    uint64_t table = 0;
    char* const bytes = (char*)malloc(1 << 20);
    size_t count = 0;
    if (library->open_path(path, NULL, &archive, &error) != ZARVO_OK)
        fprintf(stderr, "%s: %s\n", path, library->error_text(error));
    CHECK(archive != NULL);
    CHECK(library->find(archive, "tables/squares.csv", ZARVO_WHOLE, &table, NULL) == ZARVO_OK);
    CHECK(library->read(archive, table, 0, bytes, 1 << 20, &count, NULL) == ZARVO_OK);
    CheckTable(bytes, count);
    CHECK(ReadAll(library, archive) == 0);
    library->close(archive);
    free(bytes);

    size_t size = 0;
    char* const copy = ReadFile(path, &size);
    for (int spoilt = 0; spoilt < copies; ++spoilt) {
        zarvo_open_options options = ZARVO_OPEN_OPTIONS_INIT;
        options.log = CountMessage;
        options.log_context = messages;
        char* const byte = copy + (spoilt < kHeader ? (size_t)spoilt : size * (size_t)spoilt / (size_t)copies);
        *byte ^= 0x7F;
        archive = NULL;
        error = NULL;
        if (library->open_memory(copy, size, &options, &archive, &error) == ZARVO_OK)
            (void)ReadAll(library, archive); /* damage that decodes can't be seen */
        else
            CHECK(library->error_text(error)[0] != '\0');
        library->error_free(error);
        library->close(archive);
        *byte ^= 0x7F;
    }
    free(copy);
    free(path);
}

/* Makes an archive of one file, and looks at it. */
static inline void ExerciseWriter(const struct Library* library) {
    static const char kText[] = "The same, the same, the same, the same, the same.";
    char path[] = "/tmp/zarvo-exercise-XXXXXX";
    const int made = mkstemp(path);
    CHECK(made >= 0);
    close(made);
    zarvo_writer* writer = NULL;
    zarvo_create_options options = ZARVO_CREATE_OPTIONS_INIT;
    options.force = 1;
    CHECK(library->writer_new(&writer, NULL) == ZARVO_OK);
    CHECK(library->writer_add_memory(writer, "text", ZARVO_WHOLE, kText, sizeof(kText), NULL) == ZARVO_OK);
    CHECK(library->writer_write(writer, path, NULL, &options, NULL, NULL) == ZARVO_OK);
    library->writer_free(writer);
    zarvo_archive* archive = NULL;
    CHECK(library->open_path(path, NULL, &archive, NULL) == ZARVO_OK);
    CHECK(library->entry_count(archive) == 1);
    CHECK(ReadAll(library, archive) == 0);
    library->close(archive);
    unlink(path);
}

static inline void ExerciseAll(const struct Library* library, const char* samples) {
    int messages = 0;
    for (int number = 0; number < 4; ++number)
        Exercise(library, samples, number, 2 * kHeader, &messages);
    CHECK(messages > 0);
    ExerciseWriter(library);
}

#endif
