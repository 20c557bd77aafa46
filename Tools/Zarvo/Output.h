// What the command writes: results to standard output through a large buffer, and messages to standard error, one line
// each. One thread's.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <string_view>

// Results. After a failure, all that is written is dropped; once a signal asks the run to end, what the descriptor does
// not take at once.
class OutputBuffer {
public:
    // signal: holds the number of a signal that has come, or 0. May be nullptr.
    OutputBuffer(int descriptor, bool isTerminal, const std::atomic<int>* signal);

    void Write(std::string_view bytes) {
        if (bytes.size() <= m_Buffer.size() - m_Used) { // nearly always: a list's lines are short
            bytes.copy(m_Buffer.data() + m_Used, bytes.size());
            m_Used += bytes.size();
        } else {
            WriteMore(bytes);
        }
    }

    // A text out of an archive: with its control characters escaped on a terminal.
    void WriteText(std::string_view text) {
        if (m_IsTerminal)
            WriteEscaped(text);
        else
            Write(text);
    }

    void Flush();

    bool IsTerminal() const { return m_IsTerminal; }

    // Nothing more need be written: a write has failed, or a signal has come.
    bool IsClosed() const { return m_Error != 0 || HasSignal(); }

    bool HasSignal() const { return m_Signal != nullptr && *m_Signal != 0; }

    // Nobody waits for the run any more: a signal has come, or whoever read the results has gone.
    bool IsAbandoned() const;

    // The errno of the write that failed, or 0.
    int GetError() const { return m_Error; }

    // How many bytes the system has taken.
    uint64_t GetWritten() const { return m_Written; }

private:
    void WriteMore(std::string_view bytes);
    void WriteEscaped(std::string_view text);
    void WriteNow(std::string_view bytes);

    int m_Descriptor;
    bool m_IsTerminal;
    const std::atomic<int>* m_Signal;
    int m_Error = 0;
    uint64_t m_Written = 0;
    std::string m_Buffer;
    size_t m_Used = 0; // bytes of m_Buffer that wait
};

// Messages and progress. Results that wait in the output are written before a message, so that both are in order where
// they go to the same place. Failures of standard error are ignored.
class Console {
public:
    Console(int descriptor, bool isTerminal, OutputBuffer& output)
        : m_Descriptor(descriptor), m_IsTerminal(isTerminal), m_Output(output) {}

    // One line, "zarvo: NAME: text", with control characters escaped.
    void Say(std::string_view name, std::string_view text);

    // "zarvo: text", of the run itself.
    void Say(std::string_view text);

    // On a terminal a line that the next one, or a message, replaces; elsewhere a line of its own.
    void ShowProgress(std::string_view text);

    // Removes what ShowProgress has left on a terminal.
    void WipeProgress();

    bool IsTerminal() const { return m_IsTerminal; }

private:
    void Write(std::string_view text) const;

    int m_Descriptor;
    bool m_IsTerminal;
    bool m_HasProgress = false;
    OutputBuffer& m_Output;
};
