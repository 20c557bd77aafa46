#include "Library/Handles.h"

#ifdef NDEBUG

bool IsLiveHandle(const void* handle) { return handle != nullptr; }
void AddHandle(const void*) {}
void RemoveHandle(const void*) {}

#else

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Threads/Mutex.h"

static Mutex s_Lock;
static dynamic_array<const void*> s_Handles VARNEX_GUARDED_BY(s_Lock);

bool IsLiveHandle(const void* handle) {
    Mutex::AutoLock lock(s_Lock);
    for (const void* live : s_Handles)
        if (live == handle) return true;
    return false;
}

void AddHandle(const void* handle) {
    Mutex::AutoLock lock(s_Lock);
    s_Handles.push_back(handle);
}

void RemoveHandle(const void* handle) {
    Mutex::AutoLock lock(s_Lock);
    for (const void*& live : s_Handles) {
        if (live != handle) continue;
        live = s_Handles[s_Handles.size() - 1];
        s_Handles.truncate(s_Handles.size() - 1);
        return;
    }
}

#endif
