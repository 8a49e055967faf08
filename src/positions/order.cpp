// The one order of positions: content and annotation text.
#include "positions/order.h"

extern "C" AN_API int16_t ANCompPos(const ANPos *a, const ANPos *b) { return ANComparePos(*a, *b); }

extern "C" AN_API uint32_t ANIsAnnoTextPos(const ANPos *pos) {
    return pos->kind == ANPOS_ANNOTEXT ? 1 : 0;
}
