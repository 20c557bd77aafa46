/* Loads the library, reads and unloads it, a thousand times; the leak sanitizer watches: LoadedAgain SAMPLES LIBRARY */
#include "Exercise.h"

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 3);
    int messages = 0;
    for (int time = 0; time < 1000; ++time) {
        const struct Library library = Load(dlopen(arguments[2], RTLD_NOW));
        Exercise(&library, arguments[1], time, 1, &messages);
        CHECK(dlclose(library.loaded) == 0);
        CHECK(dlopen(arguments[2], RTLD_NOW | RTLD_NOLOAD) == NULL);
    }
    return 0;
}
