#include <kovanetsdk/tunnel.h>

#include <ctime>

extern "C" int KOVASchedGetNowIndex(void) {
    constexpr int kHoursOfDay = 24;
    const time_t now = time(nullptr);
    tm local{};
    tzset(); // the zone may have been set anew since the program started
    localtime_r(&now, &local);
    return local.tm_wday * kHoursOfDay + local.tm_hour;
}
