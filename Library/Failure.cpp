#include "Library/Failure.h"

#include "Runtime/Allocator/Allocator.h"

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <utility>

struct zarvo_error {
    Failure failure;
};

// Given out where no memory is left for an error of its own; never freed.
static zarvo_error s_NoMemory = {{ZARVO_ERROR_MEMORY, 0, "out of memory"}};

zarvo_code Failure::Set(zarvo_code newCode, const char* format, ...) {
    code = newCode;
    systemCode = 0;
    va_list arguments;
    va_start(arguments, format);
    (void)vsnprintf(text, sizeof(text), format, arguments); // cut where it is longer
    va_end(arguments);
    return code;
}

zarvo_code Failure::SetSystem(int error, const char* what) {
    const char* reason = strerrordesc_np(error); // unlike strerror: any thread, and the same words in every locale
    if (reason == nullptr) reason = "Unknown error";
    if (what == nullptr)
        (void)Set(ZARVO_ERROR_SYSTEM, "%s", reason);
    else
        (void)Set(ZARVO_ERROR_SYSTEM, "%s: %s", reason, what);
    systemCode = error;
    return code;
}

RareFailure::~RareFailure() {
    if (m_Failure != &s_NoMemory.failure) Delete(const_cast<Failure*>(m_Failure), kMemLabelGeneral);
}

void RareFailure::Set(const Failure& failure) {
    RareFailure before;
    std::swap(before.m_Failure, m_Failure);
    m_Failure = New<Failure>(kMemLabelGeneral, failure);
    if (m_Failure == nullptr) m_Failure = &s_NoMemory.failure;
}

zarvo_code Deliver(zarvo_code code, const Failure& failure, zarvo_error** error) {
    if (code == ZARVO_OK || error == nullptr) return code;
    *error = New<zarvo_error>(kMemLabelGeneral, zarvo_error{failure});
    if (*error == nullptr) *error = &s_NoMemory;
    return code;
}

zarvo_code zarvo_error_code(const zarvo_error* error) { return error != nullptr ? error->failure.code : ZARVO_OK; }
int zarvo_error_errno(const zarvo_error* error) { return error != nullptr ? error->failure.systemCode : 0; }
const char* zarvo_error_text(const zarvo_error* error) { return error != nullptr ? error->failure.text : ""; }

void zarvo_error_free(zarvo_error* error) {
    if (error != &s_NoMemory) Delete(error, kMemLabelGeneral);
}
