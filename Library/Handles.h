// The objects that callers hold. In debug builds a pointer that is none of them (closed already, or never opened) is
// told from one that is, so that its use is an error instead of a crash; otherwise only null is. Any thread.
#pragma once

// Null is never live.
[[nodiscard]] bool IsLiveHandle(const void* handle);
void AddHandle(const void* handle);
void RemoveHandle(const void* handle);
