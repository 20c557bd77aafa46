/* Reads with two private copies of the library at once, a thread each: one copy is loaded from a file of its own, then
 * one into a name space of its own: TwoCopies SAMPLES LIBRARY OTHER_LIBRARY */
#include "Exercise.h"

#include <pthread.h>

static const char* s_Samples;

static void* ExerciseOne(void* library) {
    ExerciseAll((const struct Library*)library, s_Samples);
    return NULL;
}

static void ExerciseBoth(const char* path, void* loaded, void* other) {
    struct Library libraries[] = {Load(loaded), Load(other)};
    CHECK(libraries[0].read != libraries[1].read);
    pthread_t thread;
    CHECK(pthread_create(&thread, NULL, ExerciseOne, &libraries[0]) == 0);
    ExerciseOne(&libraries[1]);
    CHECK(pthread_join(thread, NULL) == 0);
    CHECK(dlclose(loaded) == 0);
    CHECK(dlopen(path, RTLD_NOW | RTLD_NOLOAD) == NULL); /* the other one does not use it */
    ExerciseOne(&libraries[1]);
    CHECK(dlclose(other) == 0);
}

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 4);
    s_Samples = arguments[1];
    const char* const path = arguments[2];
    void* loaded = dlopen(path, RTLD_NOW | RTLD_GLOBAL);
    ExerciseBoth(path, loaded, dlopen(arguments[3], RTLD_NOW | RTLD_GLOBAL));
    loaded = dlopen(path, RTLD_NOW);
    ExerciseBoth(path, loaded, dlmopen(LM_ID_NEWLM, path, RTLD_NOW));
    return 0;
}
