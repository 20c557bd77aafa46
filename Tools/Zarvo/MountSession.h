// A mount from its options to its end, by way of libfuse. One at a time in a process, as libfuse's messages and signals
// are the process's.
//
//   MountSession session(operations, context, say);
//   if (!session.Open(options, &complaint)) return wrong usage
//   if (!session.Mount(folder, &reason)) return
//   const int ended = session.Run(threads);
#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#define FUSE_USE_VERSION 312
#include <fuse3/fuse_lowlevel.h>

class MountSession {
public:
    // say: gets what libfuse reports while the mount stands, on any thread.
    MountSession(const fuse_lowlevel_ops& operations, void* context, std::function<void(std::string_view text)> say)
        : m_Operations(operations), m_Context(context), m_Say(std::move(say)) {}
    ~MountSession(); // ends the mount
    MountSession(const MountSession&) = delete;
    MountSession& operator=(const MountSession&) = delete;

    // options: texts with commas between options, of libfuse's and mount's. False when one of them is unknown or makes
    // no sense: *complaint is those, or what libfuse says of them.
    [[nodiscard]] bool Open(const std::vector<std::string>& options, std::string* complaint);

    // folder: absolute. False: *reason says why.
    [[nodiscard]] bool Mount(const std::string& folder, std::string* reason);

    // Answers, in up to so many threads, until the mount ends, which it has then. Returns 0 when somebody has unmounted
    // it, the signal that has ended it (SIGHUP, SIGINT or SIGTERM), or a negative errno.
    // hasSignal: whether one came before, which ends the mount at once with 0.
    int Run(unsigned threads, const std::function<bool()>& hasSignal);

private:
    void Unmount();
    static void Hear(fuse_log_level level, const char* format, va_list arguments);

    const fuse_lowlevel_ops& m_Operations;
    void* const m_Context;
    const std::function<void(std::string_view text)> m_Say;
    fuse_session* m_Session = nullptr;
    bool m_IsMounted = false;
    bool m_IsRunning = false;
    std::string m_Heard; // libfuse's messages before it ran
};
