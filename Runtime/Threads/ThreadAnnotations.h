// Clang's thread-safety attributes: members name the lock that guards them, and the compiler checks it. Other compilers
// ignore them.
#pragma once

#if defined(__clang__)
#define VARNEX_THREAD_ATTRIBUTE(x) __attribute__((x))
#else
#define VARNEX_THREAD_ATTRIBUTE(x)
#endif

#define VARNEX_CAPABILITY(name) VARNEX_THREAD_ATTRIBUTE(capability(name))
#define VARNEX_SCOPED_CAPABILITY VARNEX_THREAD_ATTRIBUTE(scoped_lockable)
#define VARNEX_GUARDED_BY(lock) VARNEX_THREAD_ATTRIBUTE(guarded_by(lock))
#define VARNEX_ACQUIRE(...) VARNEX_THREAD_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define VARNEX_RELEASE(...) VARNEX_THREAD_ATTRIBUTE(release_capability(__VA_ARGS__))
#define VARNEX_ACQUIRE_SHARED(...) VARNEX_THREAD_ATTRIBUTE(acquire_shared_capability(__VA_ARGS__))
#define VARNEX_RELEASE_SHARED(...) VARNEX_THREAD_ATTRIBUTE(release_shared_capability(__VA_ARGS__))
#define VARNEX_REQUIRES(...) VARNEX_THREAD_ATTRIBUTE(requires_capability(__VA_ARGS__))
#define VARNEX_NO_THREAD_SAFETY_ANALYSIS VARNEX_THREAD_ATTRIBUTE(no_thread_safety_analysis)
