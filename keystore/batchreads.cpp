// Many reads in a call. Each goes through the same steps as a short read, but a step is done for a block of reads before
// the next one: what a step needs from memory is on its way meanwhile, and segments are solved side by side. Whatever isn't a
// short read is one of its own, in its place among the others.

#include "keystore/batchreads.h"

#include "frame/boundary_private.h"
#include "keystore/check_private.h"
#include "keystore/shortread_private.h"

#include <algorithm>
#include <array>

namespace {

constexpr int Block = KFSp_SplineLanes::Count;
constexpr int MostComponents = 4;
constexpr int WorthABlock = 4;  // fewer reads aren't worth making one

// One read of a block.
struct Element {
    enum class Kind {
        Single,        // by the general way
        Standing,      // the cache record stands at the time, or is a constant's
        Key,           // what key `a` says
        Interpolated,  // between `a` and `b`
    };

    Kind kind = Kind::Single;
    bool isSolved = false;
    int time = 0;
    KFS_KeyScalar const* a = nullptr;
    KFS_KeyScalar const* b = nullptr;
    std::array<double, MostComponents> value;  // of an interpolated one
};

// Where the time lies between the keys. Looks at no key.
[[gnu::always_inline]] inline void FindKeys(KFS_StreamKeyData const* data, Element& element)
{
    int const count = (*data->keys)->count;
    int const next = data->times.LowerBound(element.time);
    bool const isPast = next >= count;
    if (next == 0 || isPast || data->times[next] == element.time) {
        element.kind = Element::Kind::Key;
        element.a = static_cast<KFS_KeyScalar const*>(KFSp_GetItem(data->keys, isPast ? next - 1 : next));
    } else {
        auto const [a, b] = KFSp_GetKeyPair(data, next - 1);
        element.kind = Element::Kind::Interpolated;
        element.a = a;
        element.b = b;
    }
}

// One component of a segment between two spline sides into a lane.
[[gnu::always_inline]] inline void FillLane(KFSp_SplineLanes& lanes, int lane, KFS_Stream const* seen,
                                            Element const& element, int component)
{
    int const dimension = seen->GetDimension();
    KFSp_TemporalRuns<double const> const from = KFSp_GetTemporalRuns(element.a, dimension);
    KFSp_TemporalRuns<double const> const to = KFSp_GetTemporalRuns(element.b, dimension);
    lanes.span[lane] = static_cast<double>(KFSp_TimeDifference(element.b->time, element.a->time));
    lanes.part[lane] = static_cast<double>(KFSp_TimeDifference(element.time, element.a->time));
    lanes.scale[lane] = static_cast<double>(seen->GetTimeScale());
    lanes.value0[lane] = from.value[component];
    lanes.outSpeed[lane] = from.outSpeed[component];
    lanes.outInfluence[lane] = from.outInfluence[component];
    lanes.value3[lane] = to.value[component];
    lanes.inSpeed[lane] = to.inSpeed[component];
    lanes.inInfluence[lane] = to.inInfluence[component];
}

// Whether the segment that the element lies in is one for lanes, on a stream whose curves may fall.
bool IsSpline(Element const& element)
{
    return element.kind == Element::Kind::Interpolated && element.a->outInterp == KFS_Interp_Spline &&
           element.b->inInterp == KFS_Interp_Spline;
}
bool MayFall(KFS_Stream const* seen)
{
    return (seen->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) == 0;
}

// Spline segments of elements, solved as soon as there are enough of them. `Elements`: where they stand.
class SplineBatch {
public:
    explicit SplineBatch(Element* elements) : elements_(elements) {}

    // Forgets what an earlier block left unsolved.
    void Begin() { used_ = 0; }

    // A hold takes one key's value; what a lane can't do is left unsolved.
    void Add(KFS_Stream const* seen, int index)
    {
        Element& element = elements_[index];
        KFS_KeyScalar const* const a = element.a;
        KFS_KeyScalar const* const b = element.b;
        if (a->outInterp == KFS_Interp_Hold || b->inInterp == KFS_Interp_Hold) {
            element.kind = Element::Kind::Key;
            if (a->outInterp != KFS_Interp_Hold) element.a = b;
            return;
        }
        if (!IsSpline(element) || !MayFall(seen)) return;
        int const dimension = seen->GetDimension();
        if (used_ + dimension > Block) Solve();
        for (int i = 0; i < dimension; ++i, ++used_) {
            FillLane(lanes_, used_, seen, element, i);
            places_[used_] = {index, i};
        }
        element.isSolved = true;
    }

    void Solve()
    {
        if (used_ > 0) KFSp_SolveSplineLanes(&lanes_, used_);
        for (int lane = 0; lane < used_; ++lane) {
            Element& element = elements_[places_[lane].element];
            element.value[static_cast<std::size_t>(places_[lane].component)] = lanes_.result[lane];
            if (lanes_.solved[lane] == 0.0) element.isSolved = false;
        }
        used_ = 0;
    }

private:
    struct Place {
        int element, component;
    };
    Element* elements_;
    KFSp_SplineLanes lanes_{};
    Place places_[Block];
    int used_ = 0;
};

// What no lane has solved. Answers the interpolation's code.
int SolveAlone(KFS_Stream const* seen, Element& element)
{
    if (element.kind != Element::Kind::Interpolated || element.isSolved) return 0;
    return KFSp_InterpolateBetween(seen, element.a, element.b, element.time, element.value.data());
}

// Leaves in the cache record what the read does.
void KeepInCache(KFS_StreamKeyData const* data, KFS_Stream const* seen, Element const& element)
{
    KFS_KeyScalar* const cache = data->cache;
    if (element.kind == Element::Kind::Key) {
        KFSp_CopyKeyShort(**data->keys, element.a, cache);
    } else if (element.kind == Element::Kind::Interpolated) {
        double* const numbers = KFSp_Numbers(cache);
        for (int i = 0; i < seen->GetDimension(); ++i) numbers[i] = element.value[static_cast<std::size_t>(i)];
        cache->time = element.time;
    }
}

double const* ValueOf(KFS_StreamKeyData const* data, Element const& element)
{
    switch (element.kind) {
    case Element::Kind::Key: return KFSp_Numbers(element.a);
    case Element::Kind::Interpolated: return element.value.data();
    case Element::Kind::Standing:
    case Element::Kind::Single: break;
    }
    return KFSp_Numbers(data->cache);
}

// The results of reads, in their order.
class Results {
public:
    explicit Results(int* codes) : codes_(codes) {}
    // Whether to go on.
    bool Take(int index, int code)
    {
        if (codes_) codes_[index] = code;
        first_.Keep(code);
        return codes_ || code == 0;
    }
    int First() const { return first_.Code(); }

private:
    int* codes_;
    KFSp_FirstError first_;
};

// Times on a stream of one dimension that lie in spline segments, which is what arrays of times mostly are: a lane each, and
// nothing else to remember.
class SplineRun {
public:
    // How many of the times from the first one on are such, at most a block. `read`: of the first one, which is short and
    // has keys.
    int Prepare(KFSp_ShortRead const& read, T_Time const* times, int count)
    {
        read_ = read;
        if (read.seen->GetDimension() != 1 || !MayFall(read.seen)) return 0;
        int const number = Fill(times, std::min(count, Block));
        if (number > 0) KFSp_SolveSplineLanes(&lanes_, number);
        for (int i = 0; i < number; ++i) {
            if (lanes_.solved[i] != 0.0) [[likely]]
                continue;
            Element element;
            element.time = times[i].value;
            FindKeys(read.data, element);
            if (SolveAlone(read.seen, element) != 0) return i;
            lanes_.result[i] = element.value[0];
        }
        return number;
    }

    // Hands their values out. False where that ends the call.
    bool Finish(bool isLimited, T_Time const* times, int number, int first, double* values, Results& results) const
    {
        for (int i = 0; i < number; ++i) {
            double* const to = values + first + i;
            *to = lanes_.result[i];
            int const code =
                isLimited ? KFSp_FakeCopyItemFunc(read_.seen, 0, KFS_Item_CacheValue, &lanes_.result[i], to) : 0;
            if (!results.Take(first + i, code)) {
                Keep(i, times[i].value);
                return false;
            }
        }
        Keep(number - 1, times[number - 1].value);
        return true;
    }

private:
    // Times that go on in the segment of the one before, by whole numbers, aren't searched.
    int Fill(T_Time const* times, int count)
    {
        unsigned int const scale = read_.seen->GetTimeScale();
        bool const isNarrow = read_.data->times.IsNarrow();
        Element element;
        int from = 0, to = 0;  // what lies between is in the element's segment
        for (int i = 0; i < count; ++i) {
            element.time = times[i].value;
            if (times[i].scale != scale) return i;
            if (element.time <= from || element.time >= to) {
                FindKeys(read_.data, element);
                if (!IsSpline(element)) return i;
                if (isNarrow) from = element.a->time, to = element.b->time;
            }
            FillLane(lanes_, i, read_.seen, element, 0);
        }
        return count;
    }

    void Keep(int lane, int time) const
    {
        KFS_KeyScalar* const cache = read_.data->cache;
        *KFSp_Numbers(cache) = lanes_.result[lane];
        cache->time = time;
    }

    KFSp_ShortRead read_{};
    KFSp_SplineLanes lanes_{};
};

// Whether the stream's class has limits. False, and no answer, where it throws, which each read then does in its place.
[[gnu::noinline]] bool AskIsLimited(KFS_Stream const* stream, bool* isLimited) noexcept
{
    try {
        *isLimited = stream->IsFloatBased();
        return true;
    } catch (...) {
        return false;
    }
}

// A block of times on one stream.
class TimesBlock {
public:
    TimesBlock(KFS_Stream const* stream, int flags) : stream_(stream), flags_(flags) {}

    // Prepares reads from `times` on and answers how many; 0 where the first one isn't short, -1 where one of the next ones
    // fails. Nothing that anybody sees has changed then or after.
    //
    // Along a list whose times ascend a search at a key's time finds that key, which is then what a record that holds it
    // would answer. On a list around the circle it needn't, so there each read goes by what the one before has left.
    int Prepare(T_Time const* times, int count)
    {
        run_ = 0;
        Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
        if (!KFSp_IsShortRead(stream_, context, times, flags_, &read_) || read_.seen->HasNoKeys() ||
            !KFSp_HasShortKeys(read_.data) || !read_.data->times.Ascends())
            return 0;
        int const dimension = read_.seen->GetDimension();
        if (dimension > MostComponents || read_.data->cache->time == read_.time) return 0;
        if (!AskIsLimited(stream_, &isLimited_)) return -1;
        run_ = runs_.Prepare(read_, times, count);
        if (run_ > 0) return run_;
        int const number = std::min(count, Block / dimension);
        unsigned int const scale = read_.seen->GetTimeScale();
        batch_.Begin();
        for (int i = 0; i < number; ++i) {
            Element& element = elements_[static_cast<std::size_t>(i)];
            if (T_ShortConvTime(times[i].value, times[i].scale, scale, &element.time) != 0) return -1;
            FindKeys(read_.data, element);
            element.isSolved = false;
            if (element.kind == Element::Kind::Interpolated) batch_.Add(read_.seen, i);
        }
        batch_.Solve();
        for (int i = 0; i < number; ++i)
            if (SolveAlone(read_.seen, elements_[static_cast<std::size_t>(i)]) != 0) return -1;
        return number;
    }

    // Hands the prepared values out. False where it ends the call.
    bool Finish(T_Time const* times, int number, int first, double* values, Results& results)
    {
        if (run_ > 0) return runs_.Finish(isLimited_, times, number, first, values, results);
        int const dimension = read_.seen->GetDimension();
        for (int i = 0; i < number; ++i) {
            double const* const from = ValueOf(read_.data, elements_[static_cast<std::size_t>(i)]);
            double* const to = values + static_cast<std::ptrdiff_t>(first + i) * dimension;
            int const code = !isLimited_ && KFSp_CopyFewDoubles(dimension, from, to)
                                 ? 0
                                 : KFSp_FakeCopyItemFunc(read_.seen, 0, KFS_Item_CacheValue, from, to);
            if (!results.Take(first + i, code)) {
                KeepUpTo(i);
                return false;
            }
        }
        KeepUpTo(number - 1);
        return true;
    }

private:
    // An interpolated value stands over what the last key that was copied has left.
    void KeepUpTo(int last)
    {
        for (int i = last; i >= 0; --i)
            if (elements_[static_cast<std::size_t>(i)].kind == Element::Kind::Key) {
                KeepInCache(read_.data, read_.seen, elements_[static_cast<std::size_t>(i)]);
                break;
            }
        KeepInCache(read_.data, read_.seen, elements_[static_cast<std::size_t>(last)]);
    }

    KFS_Stream const* stream_;
    int flags_;
    KFSp_ShortRead read_{};
    bool isLimited_ = false;
    int run_ = 0;  // how many reads are a run
    SplineRun runs_;
    std::array<Element, Block> elements_;
    SplineBatch batch_{elements_.data()};
};

// How many doubles the stream has for the thread, also where its copy isn't made yet.
int DimensionOf(KFS_Stream const* stream)
{
    if (stream->GetStamp() != KFS_StreamValidStamp) return 0;  // nothing is written
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    KFS_StreamKeyData const* const data =
        context ? KFSp_KeyDataDoor::Find(stream, context, KFSp_GetRenderStates(context)) : nullptr;
    return std::max<int>(data ? data->stream->GetDimension() : stream->GetDimension(), 0);
}

}  // namespace

int KFS_ReadTimes(KFS_Stream const* stream, T_Time const* times, int count, int flags, double* values, int* codes)
{
    Results results(codes);
    int const dimension = DimensionOf(stream);
    bool goesOn = true;
    auto const readAlone = [&](int i) {
        double* const to = values + static_cast<std::ptrdiff_t>(i) * dimension;
        goesOn = results.Take(i, KFS_GetValueFPlus(stream, &times[i], flags, to, nullptr, nullptr));
    };
    if (count < WorthABlock) {
        for (int i = 0; i < count && goesOn; ++i) readAlone(i);
        return results.First();
    }
    TimesBlock block(stream, flags);
    for (int i = 0; i < count && goesOn;) {
        int const number = block.Prepare(times + i, count - i);
        if (number > 0) {
            goesOn = block.Finish(times + i, number, i, values, results);
            i += number;
            continue;
        }
        for (int const end = i + std::min(count - i, number == 0 ? 1 : Block); i < end && goesOn; ++i) readAlone(i);
    }
    return results.First();
}

namespace {

// A block of streams at one time.
class StreamsBlock {
public:
    StreamsBlock(T_Time const* time, int flags) : time_(time), flags_(flags) {}

    // Prepares reads of `number` streams, at most Block. Nothing that anybody sees has changed then or after.
    void Prepare(KFS_Stream const* const* streams, int number, Q_RenderContext const* context)
    {
        for (int i = 0; i < number; ++i) Find(streams[i], context, i);
        for (int i = 0; i < number; ++i)
            if (elements_[static_cast<std::size_t>(i)].kind == Element::Kind::Interpolated)
                batch_.Add(reads_[static_cast<std::size_t>(i)].seen, i);
        batch_.Solve();
    }

    // One of them, its value to `to`. Reads by the general way may have read others of the block, at other times: keys say
    // the same after that, but a record stands elsewhere.
    int Finish(KFS_Stream const* stream, int index, double* to)
    {
        Element& element = elements_[static_cast<std::size_t>(index)];
        KFSp_ShortRead const& read = reads_[static_cast<std::size_t>(index)];
        bool const moved =
            element.kind == Element::Kind::Standing && !read.seen->HasNoKeys() && read.data->cache->time != read.time;
        if (element.kind == Element::Kind::Single || moved || SolveAlone(read.seen, element) != 0)
            return KFS_GetValueFPlus(stream, time_, flags_, to, nullptr, nullptr);
        if (read.seen->HasNoKeys())
            KFSp_MoveConstant(read.data, read.time);
        else
            KeepInCache(read.data, read.seen, element);
        return KFSp_EndDoubles(stream, read.seen, ValueOf(read.data, element), to);
    }

private:
    void Find(KFS_Stream const* stream, Q_RenderContext const* context, int index)
    {
        Element& element = elements_[static_cast<std::size_t>(index)];
        KFSp_ShortRead& read = reads_[static_cast<std::size_t>(index)];
        element.kind = Element::Kind::Single;
        element.isSolved = false;
        if (!time_ || !KFSp_IsShortRead(stream, context, time_, flags_, &read) ||
            read.seen->GetDimension() > MostComponents)
            return;
        bool const isConstant = read.seen->HasNoKeys();
        if (isConstant ? KFSp_CacheIsEmpty(read.data->cache)
                       : !KFSp_HasShortKeys(read.data) || !read.data->times.Ascends())
            return;
        element.time = read.time;
        element.kind = Element::Kind::Standing;
        if (isConstant || (read.data->cache->time == read.time && read.time != KFS_INVALID_INDEX)) return;
        FindKeys(read.data, element);
        Fetch(element.a);
        if (element.b) Fetch(element.b);
    }

    static void Fetch(KFS_KeyScalar const* key)
    {
        __builtin_prefetch(key);
        __builtin_prefetch(reinterpret_cast<char const*>(key) + KFS_KeyHeadSize + 4 * sizeof(double));
    }

    T_Time const* time_;
    int flags_;
    std::array<KFSp_ShortRead, Block> reads_;
    std::array<Element, Block> elements_;
    SplineBatch batch_{elements_.data()};
};

// Has what reads will need brought from memory: the streams two blocks ahead, and what they lead to one block ahead.
class Fetcher {
public:
    Fetcher(KFS_Stream const* const* streams, int count, Q_RenderContext const* context)
        : streams_(streams),
          count_(count),
          context_(context)
    {
        for (int i = 0; i < std::min(count, 2 * Block); ++i) KFSp_KeyDataDoor::Fetch(streams[i]);
        FetchKeys(0);
    }

    // Before the block that begins there.
    void Advance(int begin)
    {
        for (int i = begin + 2 * Block; i < std::min(count_, begin + 3 * Block); ++i)
            KFSp_KeyDataDoor::Fetch(streams_[i]);
        FetchKeys(begin + Block);
    }

private:
    void FetchKeys(int begin)
    {
        if (!context_) return;
        KFSp_RenderStates const& states = KFSp_GetRenderStates(context_);
        for (int i = begin; i < std::min(count_, begin + Block); ++i) {
            if (streams_[i]->GetStamp() != KFS_StreamValidStamp) continue;
            KFS_StreamKeyData const* const data = KFSp_KeyDataDoor::Find(streams_[i], context_, states);
            if (!data) continue;
            if (data->stream != streams_[i]) KFSp_KeyDataDoor::Fetch(data->stream);
            __builtin_prefetch(data->keys);
            __builtin_prefetch(data->times.Data());
            __builtin_prefetch(data->cache, 1);
        }
    }

    KFS_Stream const* const* streams_;
    int count_;
    Q_RenderContext const* context_;
};

}  // namespace

int KFS_ReadStreams(KFS_Stream const* const* streams, int count, T_Time const* time, int flags, double* values,
                    int stride, int* codes)
{
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    Results results(codes);
    StreamsBlock block(time, flags);
    Fetcher fetcher(streams, count, context);
    for (int begin = 0; begin < count; begin += Block) {
        int const number = std::min(count - begin, Block);
        fetcher.Advance(begin);
        block.Prepare(streams + begin, number, context);
        for (int i = 0; i < number; ++i) {
            double* const to = values + static_cast<std::ptrdiff_t>(begin + i) * stride;
            if (!results.Take(begin + i, block.Finish(streams[begin + i], i, to))) return results.First();
        }
    }
    return results.First();
}
