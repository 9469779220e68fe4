// Doubles inside, ten element types outside. Callers' buffers may lie anywhere, so elements are moved as bytes.

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/math.h"
#include "keystore/items_private.h"

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>

namespace {

constexpr double UnitsPerFixed = 65536.0;
constexpr double FixedPerUnit = 1.52587890625e-5;

template <class Element>
struct Integer {
    static double ToDouble(Element element) { return static_cast<double>(element); }
    static Element FromDouble(double number) { return static_cast<Element>(M_RoundDouble(number)); }
};

// 16.16 in the low 32 bits of the truncated sum. A sum beyond 64 bits saturates, a NaN is 0.
template <class Element>
struct Fixed {
    static double ToDouble(Element element) { return static_cast<double>(element) * FixedPerUnit; }
    static Element FromDouble(double number)
    {
        double const sum = number * UnitsPerFixed + (number < 0.0 ? -0.5 : 0.5);
        constexpr double beyond = 9223372036854775808.0;  // 2 to the 63rd
        std::int64_t whole = 0;
        if (sum >= beyond)
            whole = std::numeric_limits<std::int64_t>::max();
        else if (sum < -beyond)
            whole = std::numeric_limits<std::int64_t>::min();
        else if (sum == sum)
            whole = static_cast<std::int64_t>(sum);
        return static_cast<Element>(whole);
    }
};

struct Float {
    static double ToDouble(float element) { return static_cast<double>(element); }
    static float FromDouble(double number) { return static_cast<float>(number); }
};

template <class Element, class Rule>
void ElementsToDoubles(int count, void const* source, void* destination)
{
    for (int i = 0; i < count; ++i) {
        Element element;
        std::memcpy(&element, static_cast<char const*>(source) + static_cast<std::size_t>(i) * sizeof element,
                    sizeof element);
        double const number = Rule::ToDouble(element);
        std::memcpy(static_cast<char*>(destination) + static_cast<std::size_t>(i) * sizeof number, &number,
                    sizeof number);
    }
}

// No element is longer than a double, so going up never overwrites what is still to be read where both buffers are one.
template <class Element, class Rule>
void ElementsFromDoubles(int count, void const* source, void* destination)
{
    for (int i = 0; i < count; ++i) {
        double number;
        std::memcpy(&number, static_cast<char const*>(source) + static_cast<std::size_t>(i) * sizeof number,
                    sizeof number);
        Element const element = Rule::FromDouble(number);
        std::memcpy(static_cast<char*>(destination) + static_cast<std::size_t>(i) * sizeof element, &element,
                    sizeof element);
    }
}

void CopyDoubles(int count, void const* source, void* destination)
{
    if (count > 0) std::memmove(destination, source, static_cast<std::size_t>(count) * sizeof(double));
}

struct Conversion {
    void (*toDoubles)(int count, void const* source, void* destination);
    void (*fromDoubles)(int count, void const* source, void* destination);
};

template <class Element, class Rule>
constexpr Conversion ConversionOf{ElementsToDoubles<Element, Rule>, ElementsFromDoubles<Element, Rule>};

// By KFS_Type.
constexpr Conversion Conversions[] = {
    ConversionOf<std::int8_t, Integer<std::int8_t>>,
    ConversionOf<std::uint8_t, Integer<std::uint8_t>>,
    ConversionOf<std::int16_t, Integer<std::int16_t>>,
    ConversionOf<std::uint16_t, Integer<std::uint16_t>>,
    ConversionOf<std::int32_t, Integer<std::int32_t>>,
    ConversionOf<std::uint32_t, Integer<std::uint32_t>>,
    ConversionOf<std::int32_t, Fixed<std::int32_t>>,
    ConversionOf<std::uint32_t, Fixed<std::uint32_t>>,
    ConversionOf<float, Float>,
    {CopyDoubles, CopyDoubles},
};
static_assert(std::size(Conversions) == KFS_Type_Double + 1);

// Null for a code without a meaning, such as that of a stream whose description was never filled in.
Conversion const* FindConversion(long dataType)
{
    auto const type = static_cast<std::size_t>(dataType & 0xFF);
    return type < std::size(Conversions) ? &Conversions[type] : nullptr;
}

// How many doubles a block of a plain stream has.
int ElementCount(KFS_Stream const* stream, short kind)
{
    int const dimension = stream->GetDimension();
    switch (kind) {
    case KFS_Item_CacheWhole:
    case KFS_Item_KeyWhole:
        // A custom record that passes for a plain one for a while holds a value and no tangents.
        if (stream->IsTemporarilyNonCustom()) return dimension;
        return stream->IsSpatial() ? 3 * dimension : 5 * dimension;
    case KFS_Item_CacheValue:
    case KFS_Item_KeyValue: return dimension;
    case KFS_Item_Component: return 1;
    default: return 0;
    }
}

void MoveBlock(KFS_Stream const* stream, short kind, void const* source, void* destination)
{
    if (stream->IsCustom())
        std::memmove(destination, source, stream->GetValueDesc()->itemSize);
    else
        CopyDoubles(ElementCount(stream, kind), source, destination);
}

}  // namespace

int KFSp_ConvertItemToFloat(KFS_Stream const* stream, long, short kind, void const* source, void* destination)
{
    if (stream->IsCustom()) return KFSp_RefuseCustomValue(KFSp_Op_ConvertToFloat, KFSp_Row_ConvertTo);
    if (Conversion const* const conversion = FindConversion(stream->GetValueDesc()->dataType))
        conversion->toDoubles(ElementCount(stream, kind), source, destination);
    return 0;
}

int KFSp_ConvertItemFromFloat(KFS_Stream const* stream, long, short kind, void const* source, void* destination)
{
    if (stream->IsCustom()) return KFSp_RefuseCustomValue(KFSp_Op_ConvertFromFloat, KFSp_Row_ConvertFrom);
    if (Conversion const* const conversion = FindConversion(stream->GetValueDesc()->dataType))
        conversion->fromDoubles(ElementCount(stream, kind), source, destination);
    return 0;
}

int KFS_ConvertItemFromFloat(short count, char dataType, double const* source, void* destination)
{
    if (Conversion const* const conversion = FindConversion(dataType))
        conversion->fromDoubles(count, source, destination);
    return 0;
}

int KFSp_FakeCopyItemFunc(KFS_Stream const* stream, long, short kind, void const* source, void* destination)
{
    MoveBlock(stream, kind, source, destination);
    KFS_Stream const* const original = stream->GetOriginal();  // which has the class, and so the limits
    if (kind == KFS_Item_Component || !original->IsFloatBased()) return 0;
    return KFSp_Boundary([&] { original->GetAsLeaf()->LegalizeValue(static_cast<double*>(destination)); });
}

int KFSp_FakeCopyItemFuncNoLimits(KFS_Stream const* stream, long, short kind, void const* source, void* destination)
{
    MoveBlock(stream, kind, source, destination);
    return 0;
}
