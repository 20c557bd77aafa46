/* A program in C that is linked with the library: Linked SAMPLES */
#include "Exercise.h"

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 2);
    const struct Library library = {
#define LINKED(name) zarvo_##name,
        FUNCTIONS(LINKED)
#undef LINKED
            NULL,
    };
    ExerciseAll(&library, arguments[1]);
    return 0;
}
