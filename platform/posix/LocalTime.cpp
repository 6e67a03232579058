#include "platform/LocalTime.h"

#include <cstring>
#include <ctime>

namespace platform {

void LocalTimeText(char (&text)[kLocalTimeLength + 1]) {
    text[0] = '\0';
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    // Room for years of more than four digits, which asctime_r writes without asking.
    char full[64] = {};
    // unreachable: both fail for years of more than 32 bits alone
    if (!localtime_r(&now, &local) || !asctime_r(&local, full)) return;
    std::memcpy(text, full, kLocalTimeLength);
    text[kLocalTimeLength] = '\0';
}

}  // namespace platform
