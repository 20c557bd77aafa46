#include "Tools/Zarvo/MountSession.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <sys/mman.h>
#include <unistd.h>

namespace {

MountSession* g_Session = nullptr; // whose messages libfuse reports

// The first line of a message, without the name of the program that writes it.
std::string GetReason(std::string text) {
    text = text.substr(0, text.find('\n'));
    for (const std::string_view name : {"fuse: ", "fusermount3: "})
        if (text.starts_with(name)) text.erase(0, name.size());
    return text;
}

// The options that libfuse complains of: "unknown option(s): `-o these'". All of it, if it complains of something else.
std::string GetUnknown(const std::string& reason) {
    constexpr std::string_view kStart = "`-o ";
    const size_t start = reason.find(kStart), end = reason.rfind('\'');
    if (start == std::string::npos || end == std::string::npos || end < start + kStart.size()) return reason;
    return reason.substr(start + kStart.size(), end - start - kStart.size());
}

// Keeps what is written to standard error while it lives: fusermount3, which libfuse starts, has no other way to say
// what is wrong.
class ErrorCapture {
public:
    ErrorCapture() : m_Before(dup(STDERR_FILENO)), m_File(memfd_create("stderr", MFD_CLOEXEC)) {
        if (m_Before >= 0 && m_File >= 0) dup2(m_File, STDERR_FILENO);
    }
    ~ErrorCapture() {
        if (m_Before >= 0) dup2(m_Before, STDERR_FILENO);
        for (const int descriptor : {m_Before, m_File})
            if (descriptor >= 0) close(descriptor);
    }
    ErrorCapture(const ErrorCapture&) = delete;
    ErrorCapture& operator=(const ErrorCapture&) = delete;

    std::string Read() const {
        char text[1'024];
        const ssize_t count = pread(m_File, text, sizeof(text), 0);
        return {text, count > 0 ? static_cast<size_t>(count) : 0};
    }

private:
    const int m_Before;
    const int m_File;
};

// libfuse handles signals whose action is the default one, and leaves the default one. What was there before comes
// back.
class SignalGuard {
public:
    explicit SignalGuard(fuse_session* session) : m_Session(session) {
        for (size_t index = 0; index < kSignals.size(); ++index) {
            sigaction(kSignals[index], nullptr, &m_Before[index]);
            if (m_Before[index].sa_handler != SIG_IGN) (void)signal(kSignals[index], SIG_DFL);
        }
        fuse_set_signal_handlers(session);
    }
    ~SignalGuard() {
        fuse_remove_signal_handlers(m_Session);
        for (size_t index = 0; index < kSignals.size(); ++index)
            sigaction(kSignals[index], &m_Before[index], nullptr);
    }
    SignalGuard(const SignalGuard&) = delete;
    SignalGuard& operator=(const SignalGuard&) = delete;

private:
    static constexpr std::array<int, 3> kSignals = {SIGHUP, SIGINT, SIGTERM};
    fuse_session* const m_Session;
    std::array<struct sigaction, kSignals.size()> m_Before = {};
};

} // namespace

void MountSession::Hear(fuse_log_level, const char* format, va_list arguments) {
    char text[1'024];
    (void)vsnprintf(text, sizeof(text), format, arguments);
    MountSession* const session = g_Session;
    if (session == nullptr) return;
    if (session->m_IsRunning)
        session->m_Say(GetReason(text));
    else
        session->m_Heard += text;
}

MountSession::~MountSession() {
    Unmount();
    if (m_Session != nullptr) fuse_session_destroy(m_Session);
    g_Session = nullptr;
}

bool MountSession::Open(const std::vector<std::string>& options, std::string* complaint) {
    g_Session = this;
    fuse_set_log_func(&MountSession::Hear);
    fuse_args arguments = FUSE_ARGS_INIT(0, nullptr);
    fuse_opt_add_arg(&arguments, "zarvo");
    for (const std::string& option : options) {
        fuse_opt_add_arg(&arguments, "-o");
        fuse_opt_add_arg(&arguments, option.c_str());
    }
    m_Session = fuse_session_new(&arguments, &m_Operations, sizeof(m_Operations), m_Context);
    if (m_Session == nullptr) *complaint = GetUnknown(GetReason(m_Heard));
    fuse_opt_free_args(&arguments);
    m_Heard.clear();
    return m_Session != nullptr;
}

bool MountSession::Mount(const std::string& folder, std::string* reason) {
    const ErrorCapture capture;
    m_IsMounted = fuse_session_mount(m_Session, folder.c_str()) == 0;
    if (m_IsMounted) return true;
    const std::string said = GetReason(capture.Read());
    *reason = !said.empty() ? said : GetReason(m_Heard);
    return false;
}

void MountSession::Unmount() {
    if (!m_IsMounted) return;
    const ErrorCapture capture; // unmounting what is unmounted is no error
    fuse_session_unmount(m_Session);
    m_IsMounted = false;
}

int MountSession::Run(unsigned threads, const std::function<bool()>& hasSignal) {
    fuse_loop_config* const config = fuse_loop_cfg_create();
    if (config == nullptr) return -ENOMEM;
    fuse_loop_cfg_set_max_threads(config, threads);
    fuse_loop_cfg_set_idle_threads(config, threads);
    fuse_loop_cfg_set_clone_fd(config, 1);
    m_IsRunning = true;
    int ended = 0;
    {
        const SignalGuard guard(m_Session);
        if (!hasSignal()) ended = fuse_session_loop_mt(m_Session, config);
    }
    fuse_loop_cfg_destroy(config);
    m_IsRunning = false;
    Unmount();
    return ended;
}
