/* Writes one file of an archive to standard output: ReadOneFile ARCHIVE PATH */
#include <zarvo.h>

#include <stdio.h>

static int fail(const char* name, zarvo_error* error) {
    fprintf(stderr, "%s: %s\n", name, zarvo_error_text(error));
    zarvo_error_free(error);
    return 1;
}

static int write_to_output(zarvo_archive* archive, const char* path) {
    zarvo_error* error = NULL;
    uint64_t index = 0;
    zarvo_item item = ZARVO_ITEM_INIT;
    if (zarvo_find(archive, path, ZARVO_WHOLE, &index, &error) != ZARVO_OK ||
        zarvo_get_item(archive, index, &item, &error) != ZARVO_OK)
        return fail(path, error);
    if (item.kind == ZARVO_FOLDER) {
        fprintf(stderr, "%s: a folder\n", path);
        return 1;
    }
    zarvo_stream* stream = NULL;
    if (zarvo_stream_open(archive, index, &stream, &error) != ZARVO_OK) return fail(path, error);
    size_t count = 0;
    zarvo_code code;
    do {
        static char piece[65536];
        code = zarvo_stream_read(stream, piece, sizeof(piece), &count, &error);
        fwrite(piece, 1, count, stdout); /* what lies before damage, too; fflush still knows of failures */
    } while (code == ZARVO_OK && count != 0);
    zarvo_stream_free(stream);
    return code == ZARVO_OK ? 0 : fail(path, error);
}

int main(int argument_count, char** arguments) {
    if (argument_count != 3) {
        fprintf(stderr, "Usage: ReadOneFile ARCHIVE PATH\n");
        return 2;
    }
    zarvo_error* error = NULL;
    zarvo_archive* archive = NULL;
    if (zarvo_open_path(arguments[1], NULL, &archive, &error) != ZARVO_OK) return fail(arguments[1], error);
    const int status = write_to_output(archive, arguments[2]);
    zarvo_close(archive);
    return fflush(stdout) == 0 && ferror(stdout) == 0 ? status : 1;
}
