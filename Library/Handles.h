// The objects whose pointers callers hold. Debug builds recognise pointers to objects that are closed or never were
// opened, so that using one is an error instead of a crash; other builds recognise only null. Any thread. The list has
// one lock, so in debug builds a child process hangs at its first call if another thread held it at the fork.
#pragma once

// Null is never live.
[[nodiscard]] bool IsLiveHandle(const void* handle);
void AddHandle(const void* handle);
void RemoveHandle(const void* handle);
