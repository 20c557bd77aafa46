/* Processes are forked, and end, while other threads read blocks that nobody can decode, which the library reports each
 * time: Forked SAMPLES */
#include "Exercise.h"

#include <pthread.h>
#include <sys/wait.h>

enum { kBlocks = 64, kBlockSize = 4096, kUnknownKind = 7 };

static zarvo_archive* OpenUnknown(const unsigned char* bytes, size_t size) {
    zarvo_archive* archive = NULL;
    CHECK(zarvo_open_memory(bytes, size, NULL, &archive, NULL) == ZARVO_OK);
    CHECK(zarvo_block_count(archive) == kBlocks);
    return archive;
}

/* Makes an archive, and then changes the kind of its blocks. Returns its size. */
static size_t MakeUnknown(unsigned char* bytes, size_t room) {
    static char data[kBlocks * kBlockSize];
    char path[] = "/tmp/zarvo-forked-XXXXXX";
    const int made = mkstemp(path);
    CHECK(made >= 0);
    zarvo_writer* writer = NULL;
    zarvo_create_options options = ZARVO_CREATE_OPTIONS_INIT;
    options.compression = ZARVO_KIND_NONE;
    options.block_size = kBlockSize;
    options.force = 1;
    CHECK(zarvo_writer_new(&writer, NULL) == ZARVO_OK);
    CHECK(zarvo_writer_add_memory(writer, "a", ZARVO_WHOLE, data, sizeof(data), NULL) == ZARVO_OK);
    CHECK(zarvo_writer_write(writer, path, NULL, &options, NULL, NULL) == ZARVO_OK);
    zarvo_writer_free(writer);
    close(made);
    FILE* const file = fopen(path, "rb");
    CHECK(file != NULL);
    const size_t size = fread(bytes, 1, room, file);
    fclose(file);
    unlink(path);

    /* At the end: 16 bytes of hash, the blocks' count and records, the nodes' count and one node. */
    enum { kRecord = 10, kSection = 16 + 4 + kBlocks * kRecord + 4 + 20 + sizeof("a") };
    CHECK(size > kSection);
    for (int block = 0; block < kBlocks; ++block)
        bytes[size - kSection + 20 + block * kRecord + kRecord - 1] = kUnknownKind;
    return size;
}

static void ReadBlocks(zarvo_archive* archive) {
    char bytes[kBlockSize];
    size_t count = 0;
    for (int block = 0; block < kBlocks; ++block)
        CHECK(zarvo_read_block(archive, block, bytes, &count, NULL) == ZARVO_ERROR_UNSUPPORTED);
}

static void* ReadForEver(void* archive) {
    while (1)
        ReadBlocks((zarvo_archive*)archive);
    return NULL;
}

static void StartReaders(zarvo_archive* archive) {
    for (int number = 0; number < 4; ++number) {
        pthread_t thread;
        CHECK(pthread_create(&thread, NULL, ReadForEver, archive) == 0);
    }
}

static void CheckEnded(pid_t child) {
    int status = -1;
    CHECK(child > 0);
    CHECK(waitpid(child, &status, 0) == child);
    CHECK(status == 0);
}

int main(int argumentCount, char** arguments) {
    static unsigned char bytes[2 * kBlocks * kBlockSize];
    CHECK(argumentCount == 2 && arguments[1] != NULL);
    const size_t size = MakeUnknown(bytes, sizeof(bytes));
    zarvo_archive* const read = OpenUnknown(bytes, size);
    zarvo_archive* const idle = OpenUnknown(bytes, size);

    /* With static objects destroyed while threads read. */
    for (int time = 0; time < 200; ++time) {
        const pid_t child = fork();
        if (child == 0) {
            StartReaders(read);
            usleep(5000);
            exit(0);
        }
        CheckEnded(child);
    }

    /* With an archive that nobody uses at the fork. */
    StartReaders(read);
    for (int time = 0; time < 400; ++time) {
        const pid_t child = fork();
        if (child == 0) {
            alarm(10); /* a deadlock ends by it */
            ReadBlocks(idle);
            _exit(0);
        }
        CheckEnded(child);
    }
    return 0;
}
