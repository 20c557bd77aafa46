#include "Library/Messages.h"

#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/Utilities/SpookyHash.h"

#include <algorithm>
#include <cstdio>
#include <pthread.h>

static constinit thread_local MessageScope* t_Innermost = nullptr;

constexpr size_t kMaxMessages = 1000; // that are told apart: an archive full of damage has no more to say than that

static bool Holds(const dynamic_array<core::string>& messages, core::string_ref message) {
    return std::find(messages.begin(), messages.end(), message) != messages.end();
}

struct MessageHook {
    // Handed every text that the runtime is about to print; the answer is that it is not to be printed.
    static bool Collect(LogType, const char* format, va_list arguments) {
        MessageScope* const scope = t_Innermost;
        if (scope == nullptr || scope->m_Collected.size() >= kMaxMessages) return false;
        char text[512];
        const int length = vsnprintf(text, sizeof(text), format, arguments);
        if (length <= 0) return false;
        size_t end = std::min(static_cast<size_t>(length), sizeof(text) - 1);
        while (end != 0 && text[end - 1] == '\n')
            --end;
        // The same is said of many blocks, and must not fill the list.
        if (Holds(scope->m_Collected, core::string_ref(text, end))) return false;
        const size_t index = scope->m_Collected.size();
        if (scope->m_Collected.resize_initialized(index + 1)) scope->m_Collected[index].assign(text, end);
        return false;
    }
};

void InstallMessageHook() {
    static pthread_once_t once = PTHREAD_ONCE_INIT;
    pthread_once(&once, [] { gCurrentLogEntryHandler = MessageHook::Collect; });
}

void MessageLog::Tell(const core::string& message) {
    if (m_Function != nullptr && !message.empty() && IsNew(message)) m_Function(m_Context, message.c_str());
}

bool MessageLog::IsNew(const core::string& message) {
    UInt64 hash = 0;
    UInt64 otherHalf = 0;
    SpookyHash::Hash128(message.data(), message.size(), &hash, &otherHalf);
    Mutex::AutoLock lock(m_Lock);
    for (UInt64 told : m_Told)
        if (told == hash) return false;
    return m_Told.size() < kMaxMessages && m_Told.try_push_back(hash);
}

void MessageQueue::Add(dynamic_array<core::string>* messages) {
    Mutex::AutoLock lock(m_Lock);
    for (core::string& message : *messages)
        if (m_Messages.size() < kMaxMessages && !Holds(m_Messages, message))
            (void)m_Messages.try_push_back(std::move(message)); // or it is lost
}

void MessageQueue::TellAll(MessageLog* log) {
    dynamic_array<core::string> messages;
    {
        Mutex::AutoLock lock(m_Lock);
        messages = std::move(m_Messages);
    }
    std::sort(messages.begin(), messages.end());
    for (const core::string& message : messages)
        log->Tell(message);
}

MessageScope::MessageScope(MessageLog* log) : m_Log(log), m_Outer(t_Innermost) { t_Innermost = this; }
MessageScope::MessageScope(MessageQueue* queue) : m_Queue(queue), m_Outer(t_Innermost) { t_Innermost = this; }

MessageScope::~MessageScope() {
    t_Innermost = m_Outer;
    if (m_Queue != nullptr) m_Queue->Add(&m_Collected);
    if (m_Log == nullptr) return;
    for (const core::string& message : m_Collected)
        m_Log->Tell(message);
}
