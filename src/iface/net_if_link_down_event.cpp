#include <kovanetsdk/iface.h>

#include "iface/link_event.h"

using namespace kova;

extern "C" int KLIBNetIfLinkDownEvent(const char *szIfname) {
    return raise_link_event(HERE, "net/if_link_down", szIfname);
}
