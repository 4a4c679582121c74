#include <kovanetsdk/iface.h>

#include "iface/link_event.h"

using namespace kova;

extern "C" int KLIBNetIfLinkUpEvent(const char *szIfname) {
    return raise_link_event(HERE, "net/if_link_up", szIfname);
}
