#include "services/sequence/list_private.h"

namespace {

// The two kinds of iteration differ in the constness of handle and item only.
template <class List, class Func>
int CallForItem(List list, long refcon, Func func, int index)
{
    return func(list, refcon, index, SEQp_Item(**list, index));
}

template <class List, class Func>
int CallForEach(List list, long refcon, Func func)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!func) return SEQ_Err_BadArgument;
    for (int i = 0; i < (*list)->count; ++i)
        if (int const code = CallForItem(list, refcon, func, i)) return code;
    return 0;
}

}  // namespace

int SEQ_GetSortedConstItem(SEQ_Head const* const* list, long, long, void const* probe, unsigned char* found, long,
                           int* index)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    SEQ_Head const& head = **list;
    if (!head.sort) return SEQ_Err_NoSortFunc;
    if (!probe || !found || !index) return SEQ_Err_BadArgument;

    if (head.count == 0) {
        *found = 0;
        *index = 0;
        return 0;
    }
    // The first item that isn't before the probe is one of `size` items from `first` on, or the one behind them. How
    // many steps there are and how far each goes depends on the count alone, so the only thing a step waits for is its
    // own comparison: times come in an order that nothing can predict.
    int first = 0;
    int equal = -1;  // the lowest item known to compare equal
    auto const isAfter = [&](int item) {
        int const order = head.sort(head.refcon, list, probe, SEQp_Item(head, item));
        if (order == 0) equal = item;
        return order > 0;
    };
    for (int size = head.count; size > 1;) {
        int const half = size / 2;
        first = isAfter(first + half - 1) ? first + half : first;
        size -= half;
    }
    if (isAfter(first)) ++first;
    *found = equal == first ? 1 : 0;
    *index = first;
    return 0;
}

int SEQ_GetSortedItem(SEQ_Head** list, long reserved, long reserved2, void const* probe, unsigned char* found,
                      long reserved3, int* index)
{
    return SEQ_GetSortedConstItem(list, reserved, reserved2, probe, found, reserved3, index);
}

int SEQ_ForEach(SEQ_Head** list, long refcon, SEQ_IterFunc func, long)
{
    return CallForEach(list, refcon, func);
}

int SEQ_ForEachConst(SEQ_Head const* const* list, long refcon, SEQ_ConstIterFunc func, long)
{
    return CallForEach(list, refcon, func);
}

int SEQ_ForRange(SEQ_Head** list, int first, int last, long refcon, SEQ_IterFunc func, int* lastVisited)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!func) return SEQ_Err_BadArgument;
    if (!SEQp_HasIndex(**list, first) || !SEQp_HasIndex(**list, last)) return SEQ_Err_BadIndex;
    int const step = first <= last ? 1 : -1;
    for (int i = first;; i += step) {
        if (lastVisited) *lastVisited = i;
        if (int const code = CallForItem(list, refcon, func, i)) return code;
        if (i == last) return 0;
        if (!SEQp_HasIndex(**list, i + step)) return SEQ_Err_BadIndex;  // the function removed what was to come
    }
}
