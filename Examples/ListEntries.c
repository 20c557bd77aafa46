/* Prints the path of every entry, folders with a "/" at their end: ListEntries ARCHIVE */
#include <zarvo.h>

#include <stdio.h>

int main(int argument_count, char** arguments) {
    if (argument_count != 2) {
        fprintf(stderr, "Usage: ListEntries ARCHIVE\n");
        return 2;
    }
    zarvo_archive* archive = NULL;
    zarvo_error* error = NULL;
    if (zarvo_open_path(arguments[1], NULL, &archive, &error) != ZARVO_OK) {
        fprintf(stderr, "%s: %s\n", arguments[1], zarvo_error_text(error));
        zarvo_error_free(error);
        return 1;
    }
    for (uint64_t index = 0; index < zarvo_entry_count(archive); ++index) {
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        zarvo_get_entry(archive, index, &entry);
        printf("%s%s\n", entry.path, entry.kind == ZARVO_FOLDER ? "/" : "");
    }
    zarvo_close(archive);
    return fflush(stdout) == 0 && ferror(stdout) == 0 ? 0 : 1;
}
