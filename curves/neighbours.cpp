// Which keys bound a time or a key, and the curve between them: the question that everything else here begins with.
#include "curves/neighbours_private.h"

#include "frame/report_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

#include <cstring>
#include <limits>

namespace {

// One neighbour as its caller wants it.
struct Answer {
    KFS_KeyScalar** key;
    int* index;

    void SetIndex(int value) const
    {
        if (index) *index = value;
    }
};

// A key that can't be read is none.
int ReadKey(KFS_StreamKeyData const* data, int index, KFS_KeyScalar** out)
{
    KFS_KeyScalar* key = nullptr;
    int const code = KFSp_GetKey(data, index, &key);
    if (code == 0) *out = key;
    return code;
}

int ReadNeighbour(KFS_StreamKeyData const* data, int index, Answer const& answer)
{
    int const code = ReadKey(data, index, answer.key);
    if (code == 0) answer.SetIndex(index);
    return code;
}

// The first anchor from `index` on; with none left, the last key.
int WalkForward(KFS_StreamKeyData const* data, int index, Answer const& next)
{
    int const count = KFSp_ItemCount(data);
    if (index >= count) return 0;
    for (; index < count; ++index) {
        if (int const code = ReadKey(data, index, next.key)) return code;
        if (!KFSp_Floats(*next.key)) break;
    }
    next.SetIndex(index < count ? index : count - 1);
    return 0;
}

// The first anchor from `index` backwards; with none left, key 0.
int WalkBackward(KFS_StreamKeyData const* data, int index, Answer const& prev)
{
    if (index < 0) return 0;
    for (;; --index) {
        if (int const code = ReadKey(data, index, prev.key)) return code;
        if (index == 0 || !KFSp_Floats(*prev.key)) break;
    }
    prev.SetIndex(index);
    return 0;
}

bool HasNoList(KFS_Stream const* stream, KFS_StreamKeyData const* data)
{
    return stream->HasNoKeys() || KFSp_ItemCount(data) == 0;
}

bool AllKeysCount(KFS_Stream const* stream, unsigned char allKeys)
{
    return allKeys || !(stream->IsSpatial() && stream->IsSParametrized());
}

int GetAroundIndex(KFS_Stream const* stream, KFS_StreamKeyData const* data, int index, unsigned char allKeys,
                   Answer const& prev, Answer const& next)
{
    if (index == std::numeric_limits<int>::max())
        return ReadKey(data, index, next.key);  // refused like any index past the end
    if (!AllKeysCount(stream, allKeys)) {
        int const code = WalkForward(data, index + 1, next);
        return code ? code : WalkBackward(data, index - 1, prev);
    }
    if (index + 1 != KFSp_ItemCount(data)) {
        if (int const code = ReadNeighbour(data, index + 1, next)) return code;
    }
    return index >= 1 ? ReadNeighbour(data, index - 1, prev) : 0;
}

int GetAroundGap(KFS_Stream const* stream, KFS_StreamKeyData const* data, int position, unsigned char allKeys,
                 Answer const& prev, Answer const& next)
{
    if (!AllKeysCount(stream, allKeys)) {
        int const code = WalkForward(data, position, next);
        return code ? code : WalkBackward(data, position - 1, prev);
    }
    if (position != KFSp_ItemCount(data)) {
        if (int const code = ReadNeighbour(data, position, next)) return code;
    }
    return position >= 1 ? ReadNeighbour(data, position - 1, prev) : 0;
}

}  // namespace

int KFSp_GetNeighborsFromTime(KFS_Stream const* stream, int time, unsigned char allKeys, KFS_KeyScalar** at,
                              KFS_KeyScalar** prev, KFS_KeyScalar** next, int* prevIndex, int* nextIndex, int* atIndex)
{
    *at = nullptr;
    *prev = nullptr;
    *next = nullptr;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (HasNoList(stream, data)) return KFSp_ReportErr(KFSp_Op_NeighborsFromTime, KFS_Err_NoKeys, KFSp_Row_InquireKey);

    bool found = false;
    int position = 0;
    if (int const code = KFSp_SearchKeys(data, time, &found, &position)) return code;
    Answer const before{prev, prevIndex};
    Answer const after{next, nextIndex};
    if (!found) return GetAroundGap(stream, data, position, allKeys, before, after);
    if (int const code = ReadNeighbour(data, position, {at, atIndex})) return code;
    return GetAroundIndex(stream, data, position, allKeys, before, after);
}

int KFSp_GetNeighborsFromIndex(KFS_Stream const* stream, int index, unsigned char allKeys, KFS_KeyScalar** prev,
                               KFS_KeyScalar** next, int* prevIndex, int* nextIndex)
{
    *prev = nullptr;
    *next = nullptr;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (HasNoList(stream, data)) return KFSp_ReportErr(KFSp_Op_NeighborsFromIndex, KFS_Err_NoKeys, KFSp_Row_InquireKey);
    return GetAroundIndex(stream, data, index, allKeys, {prev, prevIndex}, {next, nextIndex});
}

namespace {

// The words of a record's value data, read one at a time. Those before it, back to the record's start, can be asked for
// as well; what lies outside the record is 0.
class Words {
public:
    Words(KFS_Stream const* stream, KFS_KeyScalar const* key)
        : bytes_(static_cast<char const*>(KFSp_ValueData(key))),
          first_(-KFSp_ValueDataOffset(key) / WordSize),
          end_(CountWords(stream))
    {}

    double operator[](long index) const
    {
        double word = 0.0;
        if (index >= first_ && index < end_) std::memcpy(&word, bytes_ + index * WordSize, sizeof word);
        return word;
    }

private:
    static constexpr int WordSize = sizeof(double);

    static long CountWords(KFS_Stream const* stream)
    {
        if (stream->IsCustom()) return stream->GetValueDesc()->itemSize / WordSize;
        if (stream->IsTemporarilyNonCustom()) return 0;  // the keys are a client's, their size isn't known
        return long{stream->GetDimension()} * (stream->IsSpatial() ? 3 : 5);
    }

    char const* bytes_;
    long first_;
    long end_;
};

// The two keys of the asked segment. Without an error both may be null.
int FindSegment(KFS_Stream const* stream, int keyIndex, int time, unsigned char spatial, KFS_KeyScalar** first,
                KFS_KeyScalar** second)
{
    if (keyIndex == KFS_INVALID_INDEX) {
        KFS_KeyScalar* at = nullptr;
        return KFSp_GetNeighborsFromTime(stream, time, spatial, &at, first, second, nullptr, nullptr, nullptr);
    }
    if (int const code = KFSp_GetNeighborsFromIndex(stream, keyIndex, spatial, first, second, nullptr, nullptr))
        return code;
    KFS_KeyScalar* key = nullptr;
    if (int const code = ReadKey(stream->GetKeyData(), keyIndex, &key)) return code;
    // Between anchors the speed graph runs through a float key, so the segment that contains it begins at the anchor
    // before.
    bool const insideSegment = !spatial && stream->IsSpatial() && KFSp_Roves(stream->GetKeyData(), key, keyIndex);
    if (!insideSegment) *first = key;
    return 0;
}

int FillTemporal(KFS_Stream const* stream, KFS_KeyScalar const* a, KFS_KeyScalar const* b, int dimensionIndex,
                 CRV_Curve* curve)
{
    long const d = stream->GetDimension();
    long const i = dimensionIndex;
    Words const from(stream, a);
    Words const to(stream, b);
    KFSp_TemporalEnd const start{from[i], from[3 * d + i], from[4 * d + i], a->outInterp == KFS_Interp_Spline};
    KFSp_TemporalEnd const end{to[i], to[d + i], to[2 * d + i], b->inInterp == KFS_Interp_Spline};
    KFSp_FillTemporalSegment(start, end, KFSp_Seconds(b->time, a->time, stream->GetTimeScale()), *curve);
    bool const treated = (start.spline || end.spline) && (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
    return treated ? CRV_CurveSetNonDecreasing(curve, nullptr) : 0;
}

void ShiftX(CRV_Curve* curve, double seconds)
{
    for (double* const point : {curve->p0, curve->p1, curve->p2, curve->p3}) point[0] += seconds;
}

int ConstructPinned(KFS_Stream const* stream, int keyIndex, int time, int dimensionIndex, unsigned char relativeTime,
                    unsigned char spatial, unsigned char* isHold, CRV_Curve* curve)
{
    KFS_KeyScalar* a = nullptr;
    KFS_KeyScalar* b = nullptr;
    if (int const code = FindSegment(stream, keyIndex, time, spatial, &a, &b)) return code;
    if (!a || !b) return KFSp_ReportRow(KFSp_Op_ConstructCurve, KFS_Err_TimeOutsideKeys, KFSp_Row_TimeOutsideKeys);
    if (KFSp_GetSegmentKind(a->outInterp, b->inInterp) == KFSp_SegmentKind::Hold) {
        *isHold = 1;
        return 0;
    }
    if (spatial) {
        KFSp_FillPathSegment(a, b, stream->GetDimension(), *curve);
        return 0;
    }
    if (int const code = FillTemporal(stream, a, b, dimensionIndex, curve)) return code;
    if (!relativeTime) ShiftX(curve, static_cast<double>(a->time) / static_cast<double>(stream->GetTimeScale()));
    return 0;
}

}  // namespace

int KFSp_ConstructCurve(KFS_Stream const* stream, int keyIndex, int time, int dimensionIndex,
                        unsigned char relativeTime, unsigned char spatial, unsigned char* isHold, CRV_Curve* curve)
{
    *isHold = 0;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(stream->GetKeys(), error);
        if (error.None())
            error.Keep(ConstructPinned(stream, keyIndex, time, dimensionIndex, relativeTime, spatial, isHold, curve));
    }
    return error.Code();
}
