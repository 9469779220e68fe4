// The polyline of a stream's component: segments between keys go to the curve kernel, expressions are sampled evenly.

#include "curves/adaptivesamples.h"

#include "curves/segment_private.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/errors.h"
#include "frame/report_private.h"
#include "frame/services/debug.h"
#include "frame/services/memory.h"
#include "keystore/evaluate.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <array>
#include <memory>
#include <vector>

namespace {

constexpr unsigned int ExpressionRate = 30;  // samples a second
constexpr int ScratchId = 0x1d0006;
constexpr short PointSize = 16;  // bytes of a sample and of a point of a chain
constexpr int Runs = 6;          // of `dimension` doubles in the scratch block

struct FreePtr {
    void operator()(double* block) const { Q_FreePtr(block); }
};

double Seconds(T_Time const& time)
{
    return static_cast<double>(time.value) / static_cast<double>(time.scale);
}

// What the caller wants, and what the kernel keeps of it.
struct Build {
    short dimension;
    KFS_Stream* stream;
    KFS_Stream const* seen;  // the stream as this thread reads it
    T_Time start, duration;
    KFS_AdaptiveTransformFunc* transform;
    KFS_AdaptiveSplitFunc* splitCurve;
    CRV_SampleFunc* sampleFunc;
    void* refCon;
    SEQ_Head** list;
    double* minValue;
    double* maxValue;
    unsigned char haveRange = 0;

    [[nodiscard]] int Transform(double* value) const { return transform ? transform(refCon, value) : 0; }

    void Widen(double y)
    {
        *minValue = haveRange ? std::min(*minValue, y) : y;
        *maxValue = haveRange ? std::max(*maxValue, y) : y;
        haveRange = 1;
    }
    [[nodiscard]] int Insert(double x, double y) const
    {
        double const sample[2] = {x, y};
        return SEQ_Insert(sample, -1, list);
    }
};

// ---- expressions

[[nodiscard]] int SampleExpression(Build& build, KFS_AbortChecker const& aborter)
{
    T_Time const step{1, ExpressionRate};
    T_Time time = build.start;
    bool const mayAbort = hearth::debug::DebugDatabase::Instance().GetEntryAs<bool>("KFS_AllowAbortAudio", false);
    T_Time end{};
    if (int const code = T_AddTime(&build.start, &build.duration, &end)) return code;
    if (int const code = T_AddTime(&end, &step, &end)) return code;
    std::vector<double> values(static_cast<std::size_t>(build.seen->GetDimension()));
    for (;;) {
        if (int const code = KFS_GetValueF(build.stream, &time, 0, values.data(), nullptr, nullptr)) return code;
        double y = values[static_cast<std::size_t>(build.dimension)];
        int code = build.Transform(&y);
        if (code == 0) code = build.Insert(Seconds(time), y);
        build.Widen(y);
        if (code != 0) return code;
        if (int const failed = T_AddTime(&time, &step, &time)) return failed;
        int order = 0;
        code = T_CompareTime(&time, &end, &order);
        if (code == 0 && mayAbort) code = aborter.CheckAbort();
        if (code != 0) return code;
        if (order >= 1) return 0;
    }
}

// ---- keys

// A chain of a split, which is given back whatever happens: also where the caller's test throws.
class ScPieces {
public:
    ScPieces(SEQ_Head** list, KFSp_FirstError& error) : list_(list), error_(error) {}
    ~ScPieces() { error_.Keep(SEQ_Dispose(list_, 0)); }
    ScPieces(ScPieces const&) = delete;
    ScPieces& operator=(ScPieces const&) = delete;

private:
    SEQ_Head** list_;
    KFSp_FirstError& error_;
};

// A key as the polyline sees it.
struct Key {
    int index = 0;
    double x = 0.0;    // seconds
    double raw = 0.0;  // the value as it stands
    double y = 0.0;    // the value transformed
    char inInterp = KFS_Interp_None;
    char outInterp = KFS_Interp_None;
};

class KeySampler {
public:
    // `scratch`: six runs of `dimension` doubles.
    KeySampler(Build& build, double* scratch)
        : build_(build),
          value_(scratch),
          x_(scratch + 4 * build.seen->GetDimension()),
          y_(scratch + 5 * build.seen->GetDimension()),
          startSec_(Seconds(build.start)),
          endSec_(startSec_ + Seconds(build.duration))
    {}

    [[nodiscard]] int Run(int count)
    {
        if (count == 0) return 0;
        Key previous, key;
        for (int index = 0; index < count; ++index) {
            if (int const code = Read(index, &key)) return code;
            if (index > 0 && std::min(endSec_, key.x) >= std::max(startSec_, previous.x))
                if (int const code = AddSegment(previous, key)) return code;
            if (count > 1 && key.x >= endSec_) break;
            previous = key;
        }
        if ((*build_.list)->count > 0 && count > 1) return 0;
        if (int const code = build_.Insert(key.x, key.y)) return code;
        build_.Widen(key.y);
        return 0;
    }

private:
    [[nodiscard]] int Read(int index, Key* key)
    {
        T_Time time{};
        if (int const code = KFS_IndexToTime(build_.stream, index, &time)) return code;
        if (int const code = KFS_GetKeyF(build_.stream, index, value_, &key->inInterp, &key->outInterp)) return code;
        key->index = index;
        key->x = Seconds(time);
        key->raw = key->y = value_[build_.dimension];
        return build_.Transform(&key->y);
    }

    [[nodiscard]] int Line(double const* a, double const* b, double const* point, double bound)
    {
        return CRV_LinearlyInterpolateLine(a, b, point, &build_.haveRange, build_.list, build_.minValue, bound,
                                           build_.maxValue);
    }

    [[nodiscard]] int AddSegment(Key const& from, Key const& to)
    {
        double const a[2] = {from.x, from.y};
        double const b[2] = {to.x, to.y};
        if (from.outInterp == KFS_Interp_Hold) {
            double const corner[2] = {to.x, from.y};
            if (int const code = Line(a, corner, a, startSec_)) return code;
            if (int const code = Line(a, corner, corner, endSec_)) return code;
            return endSec_ > to.x ? Line(corner, b, b, endSec_) : 0;
        }
        if (to.inInterp == KFS_Interp_Hold) {
            double const corner[2] = {from.x, to.y};
            if (int const code = Line(corner, b, corner, startSec_)) return code;
            return Line(corner, b, b, endSec_);
        }
        bool const curved = to.inInterp == KFS_Interp_Spline || from.outInterp == KFS_Interp_Spline;
        bool const straight = to.inInterp == KFS_Interp_Linear && from.outInterp == KFS_Interp_Linear;
        return curved || straight ? AddCurve(from, to) : 0;
    }

    // The handle of a side, as an offset from its key: the sixth of a linear one, or the key's.
    [[nodiscard]] int Handle(Key const& key, Key const& other, char interp, bool out, double handle[2])
    {
        if (interp == KFS_Interp_Linear) {
            handle[0] = key.x + (other.x - key.x) * KFSp_OneSixth;
            handle[1] = key.raw + (other.raw - key.raw) * KFSp_OneSixth;
        } else {
            double* const none = nullptr;
            if (int const code = KFS_GetKeyTangentsF(build_.stream, key.index, out ? none : x_, out ? none : y_,
                                                     out ? x_ : none, out ? y_ : none))
                return code;
            handle[0] = key.x + x_[build_.dimension];
            handle[1] = key.raw + y_[build_.dimension];
        }
        return build_.Transform(handle + 1);
    }

    [[nodiscard]] int AddCurve(Key const& from, Key const& to)
    {
        std::array<std::array<double, 2>, 4> points{{{from.x, from.y}, {}, {}, {to.x, to.y}}};
        if (int const code = Handle(from, to, from.outInterp, true, points[1].data())) return code;
        if (int const code = Handle(to, from, to.inInterp, false, points[2].data())) return code;
        CRV_Curve curve{2, points[0].data(), points[1].data(), points[2].data(), points[3].data()};
        if (!build_.splitCurve) return Evaluate(&curve);
        SEQ_Head** pieces = nullptr;
        if (int const code = build_.splitCurve(build_.refCon, &curve, &pieces)) return code;
        return pieces ? AddChain(pieces) : 0;
    }

    [[nodiscard]] int AddChain(SEQ_Head** pieces)
    {
        KFSp_FirstError error;
        {
            ScPieces const given(pieces, error);
            KFSp_ScPin const pin(pieces, error);
            if (error.None()) error.Keep(EvaluateChain(pieces));
        }
        return error.Code();
    }

    [[nodiscard]] int EvaluateChain(SEQ_Head** pieces)
    {
        int const count = (*pieces)->count;
        if (count < 2) return 0;
        if (SEQ_GetItemSize(pieces) != PointSize) return KFS_Err_LegacyMismatch;
        void* first = nullptr;
        if (int const code = SEQ_GetAddress(pieces, 0, 0, &first)) return code;
        auto* const points = static_cast<double*>(first);
        for (int i = 0; i + 3 < count; i += 3) {
            double* const start = points + 2 * i;
            CRV_Curve const piece{2, start, start + 2, start + 4, start + 6};
            if (int const code = Evaluate(&piece)) return code;
        }
        return 0;
    }

    [[nodiscard]] int Evaluate(CRV_Curve const* curve)
    {
        return CRV_EvaluateAdaptively(build_.sampleFunc, build_.refCon, &startSec_, &endSec_, curve, &build_.haveRange,
                                      build_.minValue, build_.maxValue, build_.list);
    }

    Build& build_;
    double* value_;
    double* x_;
    double* y_;
    double startSec_;
    double endSec_;
};

[[nodiscard]] int SampleKeys(Build& build)
{
    std::size_t const size = static_cast<std::size_t>(build.seen->GetDimension()) * Runs * sizeof(double);
    std::unique_ptr<double, FreePtr> const scratch(
        static_cast<double*>(Q_AllocatePtrClear(ScratchId, KFSp_MessageText(KFSp_Row_AdaptiveSamples), size)));
    SEQ_Head** const keys = build.seen->GetKeyData()->keys;
    if (!scratch || !keys) return 0;
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(keys, error);
        if (!error.None()) return error.Code();
        error.Keep(build.seen->UpdateStream());  // times and handles are read one by one, and belong together
        if (error.None()) error.Keep(KeySampler(build, scratch.get()).Run((*keys)->count));
    }
    return error.Code();
}

}  // namespace

int KFS_GetAdaptiveSampleStream(short dimension, KFS_Stream* stream, T_Time const* start, T_Time const* duration,
                                KFS_AdaptiveTransformFunc* transform, KFS_AdaptiveSplitFunc* splitCurve,
                                CRV_SampleFunc* sampleFunc, void* refCon, KFS_AdaptiveSampleStream* out,
                                double* minValue, double* maxValue, KFS_AbortChecker const& aborter)
{
    return KFSp_Boundary([&] {
        if (!stream || !start || !duration || !out || !out->samples) return 0;
        KFS_Stream const* const seen = KFSp_Seen(stream);
        if (dimension < 0 || dimension >= seen->GetDimension()) return int{KFS_Err_LegacyMismatch};
        if (SEQ_GetItemSize(out->samples) != PointSize) return int{KFS_Err_LegacyMismatch};
        Build build{dimension,  stream,     seen,   *start,       *duration, transform,
                    splitCurve, sampleFunc, refCon, out->samples, minValue,  maxValue};
        return seen->HasActiveExpression() ? SampleExpression(build, aborter) : SampleKeys(build);
    });
}
