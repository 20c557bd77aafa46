// A program whose own classes and operators are named as the runtime's are: OwnNames SAMPLES. Built with small classes
// and with big ones (OBJECT_SIZE), and with every name exported to the libraries.
#include "Exercise.h"

#include <cstddef>
#include <new>

namespace {

int s_Met = 0; // uses of the names below

} // namespace

class Mutex {
public:
    Mutex();
    ~Mutex();
    void Lock();
    void Unlock();
    bool IsLockedByCurrentThread() const;

private:
    char m_Bytes[OBJECT_SIZE];
};

class FileSystem {
public:
    FileSystem();
    ~FileSystem();

private:
    char m_Bytes[OBJECT_SIZE];
};

class Rand {
public:
    void RandomizeState(bool (*entropy)(unsigned char*, size_t), struct RandSeedBlock* hashed);

private:
    char m_Bytes[OBJECT_SIZE];
};

// Each writes over all that it takes for its own.
Mutex::Mutex() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
Mutex::~Mutex() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
void Mutex::Lock() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
void Mutex::Unlock() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
bool Mutex::IsLockedByCurrentThread() const { return m_Bytes[0] == ++s_Met; }
FileSystem::FileSystem() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
FileSystem::~FileSystem() { memset(m_Bytes, ++s_Met, sizeof(m_Bytes)); }
void Rand::RandomizeState(bool (*)(unsigned char*, size_t), RandSeedBlock*) {
    memset(m_Bytes, ++s_Met, sizeof(m_Bytes));
}
FileSystem* GetFileSystem() {
    ++s_Met;
    return nullptr;
}

void* operator new(size_t size) {
    ++s_Met;
    if (void* const memory = malloc(size + OBJECT_SIZE)) return static_cast<char*>(memory) + OBJECT_SIZE;
    abort();
}
void operator delete(void* memory) noexcept {
    ++s_Met;
    if (memory != nullptr) free(static_cast<char*>(memory) - OBJECT_SIZE);
}
void operator delete(void* memory, size_t) noexcept { operator delete(memory); }

// The program's own statics come to be before and after the library's.
static Mutex s_OwnMutex;

int main(int argumentCount, char** arguments) {
    CHECK(argumentCount == 2);
    const Library library = {
#define LINKED(name) zarvo_##name,
        FUNCTIONS(LINKED)
#undef LINKED
            nullptr,
    };
    s_OwnMutex.Lock();
    int* const object = new int(3);
    const int met = s_Met;
    CHECK(met == 3); // the mutex made and locked, the object
    ExerciseAll(&library, arguments[1]);
    CHECK(s_Met == met);
    delete object;
    s_OwnMutex.Unlock();
    return 0;
}
