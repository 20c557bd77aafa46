#include "Runtime/Math/Random/SystemEntropy.h"

#include "PlatformDependent/Linux/FileDescriptor.h"
#include "Runtime/Math/Random/EntropyDevice.h"

bool ReadEntropyDevice(const char* first, const char* second, UInt8* buffer, size_t length) {
    int descriptor = PlatformOpen(first, O_RDONLY, 0);
    if (descriptor == -1) descriptor = PlatformOpen(second, O_RDONLY | O_NONBLOCK, 0);
    if (descriptor == -1) return false;
    // A device that gives less in one read counts as failed.
    const ssize_t got = read(descriptor, buffer, length);
    (void)PlatformClose(descriptor); // opened for reading: nothing is lost
    return got >= 0 && static_cast<size_t>(got) == length;
}

bool GetSystemEntropy(UInt8* buffer, size_t length) {
    return ReadEntropyDevice("/dev/urandom", "/dev/random", buffer, length);
}
