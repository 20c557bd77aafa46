#include "Tools/Zarvo/Output.h"

#include "Tools/Zarvo/Text.h"

#include <cerrno>
#include <climits>
#include <poll.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace {

constexpr size_t kBufferSize = 1 << 18;
constexpr char kWipe[] = "\r\x1b[K"; // back to the start of the line, and erase it

// A descriptor that others have made non-blocking is waited for. Returns how many bytes were written, or -1.
ssize_t WriteOrWait(int descriptor, std::string_view bytes) {
    ssize_t count = write(descriptor, bytes.data(), bytes.size());
    if (count < 0 && errno == EAGAIN) {
        pollfd ready = {.fd = descriptor, .events = POLLOUT, .revents = 0};
        count = poll(&ready, 1, -1) < 0 ? -1 : 0;
    }
    return count;
}

// Whether PIPE_BUF bytes can be written without waiting.
bool TakesMore(int descriptor) {
    pollfd ready = {.fd = descriptor, .events = POLLOUT, .revents = 0};
    return poll(&ready, 1, 0) > 0;
}

} // namespace

OutputBuffer::OutputBuffer(int descriptor, bool isTerminal, const std::atomic<int>* signal)
    : m_Descriptor(descriptor), m_IsTerminal(isTerminal), m_Signal(signal), m_Buffer(kBufferSize, '\0') {}

void OutputBuffer::WriteMore(std::string_view bytes) {
    Flush();
    if (bytes.size() >= kBufferSize)
        WriteNow(bytes);
    else
        Write(bytes);
}

void OutputBuffer::WriteEscaped(std::string_view text) { Write(EscapeControls(text)); }

bool OutputBuffer::IsAbandoned() const { return HasSignal() || m_Error == EPIPE; }

void OutputBuffer::Flush() {
    WriteNow(std::string_view(m_Buffer).substr(0, m_Used));
    m_Used = 0;
}

void OutputBuffer::WriteNow(std::string_view bytes) {
    while (!bytes.empty() && m_Error == 0) {
        if (HasSignal() && !TakesMore(m_Descriptor)) return;
        const ssize_t count = WriteOrWait(m_Descriptor, HasSignal() ? bytes.substr(0, PIPE_BUF) : bytes);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) {
            m_Error = errno;
            return;
        }
        m_Written += static_cast<uint64_t>(count);
        bytes.remove_prefix(static_cast<size_t>(count));
    }
}

void Console::Say(std::string_view name, std::string_view text) { Say(QuoteEmpty(name) + ": " + std::string(text)); }

void Console::Say(std::string_view text) {
    m_Output.Flush();
    WipeProgress();
    Write("zarvo: " + EscapeControls(text) + "\n");
}

void Console::ShowProgress(std::string_view text) {
    winsize window = {};
    // A line that goes on in the next one could not be wiped. The terminal itself adds "^C".
    constexpr unsigned kKeptFree = 3;
    if (m_IsTerminal && ioctl(m_Descriptor, TIOCGWINSZ, &window) == 0 && window.ws_col > kKeptFree)
        text = text.substr(0, window.ws_col - kKeptFree);
    if (m_IsTerminal)
        Write(kWipe + std::string(text));
    else
        Write(std::string(text) + "\n");
    m_HasProgress = m_IsTerminal;
}

void Console::WipeProgress() {
    if (m_HasProgress) Write(kWipe);
    m_HasProgress = false;
}

void Console::Write(std::string_view text) const {
    while (!text.empty()) {
        const ssize_t count = WriteOrWait(m_Descriptor, text);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return; // there is nowhere to say so
        text.remove_prefix(static_cast<size_t>(count));
    }
}
