#pragma once

#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "frame/boundary_private.h"
#include "keystore/attributes.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "overrides/streamexpression.h"
#include "tree/streamgroup.h"

#include <climits>
#include <cstdint>
#include <random>
#include <span>
#include <vector>

// What fuzz targets do with the streams that they have got from a file. None of it looks at the results: an error is an
// answer.

// The choices that a run makes: the same for the same bytes.
class Choices {
public:
    explicit Choices(std::span<unsigned char const> bytes)
    {
        std::uint32_t hash = 2166136261U;
        for (unsigned char const byte : bytes) hash = (hash ^ byte) * 16777619U;
        random_.seed(hash);
    }
    unsigned int Below(unsigned int count) { return static_cast<unsigned int>(random_() % count); }
    bool Yes() { return Below(2) == 0; }
    template <class T, std::size_t Count>
    T Of(T const (&values)[Count])
    {
        return values[Below(Count)];
    }

private:
    std::minstd_rand random_;
};

inline constexpr int Times[] = {INT_MIN, INT_MIN + 1, -100000, -1,     0,           1,      17,
                                40,      300,         601,     100000, INT_MAX - 1, INT_MAX};
inline constexpr double Numbers[] = {0.0, 1.0, -1.0, 0.5, 100.0, 1e-300, -1e9, 1e300};

// At the times above, and at and beside each key.
inline void Ask(KFS_Stream const& stream)
{
    std::vector<double> value(static_cast<std::size_t>(stream.GetDimension()) + 1);
    auto const ask = [&](int time) {
        T_Time const at{time, stream.GetTimeScale()};
        int index = 0;
        T_Time key{};
        static_cast<void>(KFS_GetValueFPlus(&stream, &at, 0, value.data(), nullptr, nullptr));
        static_cast<void>(KFS_FindNearestKeyTime(&stream, &at, &index, &key));
        static_cast<void>(KFS_TimeToIndex(&stream, &at, &index));
    };
    for (int const time : Times) ask(time);
    for (int i = 0; i < stream.GetKeyCount(); ++i) {
        T_Time time{};
        if (KFS_IndexToTime(&stream, i, &time) == 0 && time.value > INT_MIN && time.value < INT_MAX) {
            ask(time.value);
            ask(time.value + 1);
        }
        std::vector<double> in(value.size());
        std::vector<double> out(value.size());
        static_cast<void>(KFS_GetKeyVelocityF(&stream, i, 0, in.data(), out.data()));
        static_cast<void>(KFS_GetKeyInfluence(&stream, i, in.data(), out.data()));
        static_cast<void>(KFS_GetKeySpaceTangentsF(&stream, i, 0, in.data(), out.data()));
    }
}

// One edit of a leaf that is made of numbers.
inline void EditLeaf(KFS_Stream& stream, Choices& choices)
{
    std::vector<double> numbers(static_cast<std::size_t>(stream.GetDimension()) + 1);
    for (double& number : numbers) number = choices.Of(Numbers);
    int const count = stream.GetKeyCount();
    int const index = count > 0 ? static_cast<int>(choices.Below(static_cast<unsigned int>(count))) : 0;
    T_Time at{choices.Of(Times), stream.GetTimeScale()};
    if (count > 0 && choices.Yes() && KFS_IndexToTime(&stream, index, &at) == 0 && at.value < INT_MAX)
        at.value += static_cast<int>(choices.Below(2));
    auto const interp = [&] { return static_cast<char>(choices.Below(4)); };
    double const* const out = choices.Yes() ? numbers.data() : nullptr;
    static_cast<void>(KFSp_Boundary([&]() -> int {
        switch (choices.Below(14)) {
        case 0: return KFS_InsertKeyF(&stream, &at, choices.Yes(), numbers.data(), interp(), interp());
        case 1: return KFS_InsertKeyF(&stream, &at, choices.Yes(), nullptr, interp(), interp());
        case 2: return KFS_SetKeyF(&stream, index, numbers.data(), interp(), interp());
        case 3: return KFS_RemoveKey(&stream, index, nullptr);
        case 4: return KFS_SetKeyTangentsF(&stream, index, numbers.data(), numbers.data(), out, out, 1.0);
        case 5: return KFS_SetKeySpaceTangentsF(&stream, index, 0, numbers.data(), out);
        case 6: return KFS_SetKeyVelocityF(&stream, index, numbers.data(), out);
        case 7: return KFS_SetKeyInfluence(&stream, index, numbers.data(), out);
        case 8: return KFS_SetKeyFloat(&stream, choices.Yes(), index);
        case 9: return KFS_SetKeyTime(&stream, index, &at, 0, nullptr, nullptr);
        case 10: return KFS_SetKeyFlags(&stream, index, 0xFFFF, static_cast<unsigned short>(choices.Below(0x10000)));
        case 11: return stream.CanBeAnimated() ? stream.SetConstant(choices.Yes(), choices.Yes()) : 0;
        case 12: return KFS_ForceUpdateStream(&stream);
        default: static_cast<void>(KFS_SetStreamExpression(&stream, Q_AsciiToUTF16String("time"))); return 0;
        }
    }));
}

// Whether its names are alike is what a node remembers, until it takes a name; also in a file, so that it would be in the
// first of two saves only.
inline void ForgetNames(KFS_StreamBase& node)
{
    node.SetNamesSameInitted(false);
    if (KFS_StreamGroup* const group = node.GetAsGroup()) {
        for (unsigned int i = 0; i < group->GetNumStreams(); ++i)
            if (KFS_StreamBase* const child = group->GetEditableStreamNullOK(i)) ForgetNames(*child);
    }
}
