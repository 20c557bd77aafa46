#include "Library/Handles.h"

#ifdef NDEBUG

bool IsLiveHandle(const void* handle) { return handle != nullptr; }
void AddHandle(const void*) {}
void RemoveHandle(const void*) {}

#else

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Threads/Mutex.h"

#include <algorithm>
#include <new>

namespace {

struct HandleList {
    Mutex lock;
    dynamic_array<const void*> handles VARNEX_GUARDED_BY(lock);
};

// It is never destroyed: other threads may go on with calls while the process ends.
HandleList& GetLiveHandles() {
    alignas(HandleList) static UInt8 s_Storage[sizeof(HandleList)];
    static HandleList* const s_List = new (s_Storage) HandleList;
    return *s_List;
}

} // namespace

bool IsLiveHandle(const void* handle) {
    HandleList& live = GetLiveHandles();
    Mutex::AutoLock lock(live.lock);
    return std::find(live.handles.begin(), live.handles.end(), handle) != live.handles.end();
}

void AddHandle(const void* handle) {
    HandleList& live = GetLiveHandles();
    Mutex::AutoLock lock(live.lock);
    live.handles.push_back(handle);
}

void RemoveHandle(const void* handle) {
    HandleList& live = GetLiveHandles();
    Mutex::AutoLock lock(live.lock);
    const void** const found = std::find(live.handles.begin(), live.handles.end(), handle);
    if (found == live.handles.end()) return;
    *found = live.handles[live.handles.size() - 1];
    live.handles.truncate(live.handles.size() - 1);
}

#endif
