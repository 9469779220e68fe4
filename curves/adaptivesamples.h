#pragma once

#include "frame/export.h"
#include "frame/services/curvekernel.h"
#include "frame/services/sequence.h"
#include "keystore/stream.h"

// A polyline of one component of a stream, in seconds against value, made once and then walked at a fixed step: inside a
// segment a step is one addition.

// The polyline. The host makes the list, with an item size of two doubles (x in seconds, y), and disposes it.
struct KFS_AdaptiveSampleStream {
    SEQ_Head** samples = nullptr;
};

// Where a walker stands. Set up by KFS_InitIterateAdaptiveSampleStream.
struct KFS_AdaptiveSampleStreamCache {
    bool inSegment = false;     // `value` and `step` are those of the segment
    double x0 = 0.0, y0 = 0.0;  // the segment's left end
    double x1 = 0.0, y1 = 0.0;  // its right end
    double slope = 0.0;
    double value = 0.0;  // at the last x
    double step = 0.0;   // what a step adds to it
};

// The host's wish to stop. The order of the virtual operations is part of the binary interface.
class KFS_AbortChecker {
public:
    virtual ~KFS_AbortChecker() = default;
    // 0 to go on.
    virtual int CheckAbort() const = 0;
};

// Changes a value in place. Another result than 0 ends the build, and is its result.
using KFS_AdaptiveTransformFunc = int(void* refCon, double* value);
// May replace a curve by a chain of cubics: `*pieces` becomes a list of points (16 bytes each), the start and then two
// handles and an end for each, which is disposed; null leaves the segment out. Another result than 0 ends the build.
using KFS_AdaptiveSplitFunc = int(void* refCon, CRV_Curve* curve, SEQ_Head*** pieces);

// Appends the samples of a span. Builds for later spans follow on.
//
//   dimension   the component
//   transform, splitCurve   may be null
//   sampleFunc  how finely curves are divided (CRV_EvaluateAdaptively); not asked for expressions
//   refCon      for the three
//   minValue, maxValue      out: the least and greatest y of this build's samples, untouched without any
//   aborter     asked between samples of an expression, and only while the debug entry "KFS_AllowAbortAudio" is on
//
// An active expression is sampled 30 times a second, to a sample behind the end. A null stream, time or list is no
// error and gives nothing, and so does a constant. Of a path the samples show the keys and, between them, no component:
// its handles are of distance by time.
//
// Result: 0; 3 for a component that the stream hasn't, or a list of other items; KFS_Err_CustomValue; the services' and
// the callbacks' codes. Samples of a failed build stay in the list; what a split gave is disposed. Brings the stream up
// to date, as reads do, and pins its keys meanwhile.
[[nodiscard]] KFS_API int KFS_GetAdaptiveSampleStream(short dimension, KFS_Stream* stream, T_Time const* start,
                                                      T_Time const* duration, KFS_AdaptiveTransformFunc* transform,
                                                      KFS_AdaptiveSplitFunc* splitCurve, CRV_SampleFunc* sampleFunc,
                                                      void* refCon, KFS_AdaptiveSampleStream* out, double* minValue,
                                                      double* maxValue, KFS_AbortChecker const& aborter);

// Begins a walk: pins the list, whose samples stand in `samples` until the walk is completed. An empty list can't be
// walked: SEQ_Err_BadIndex, and nothing stays pinned.
[[nodiscard]] KFS_API int KFS_InitIterateAdaptiveSampleStream(KFS_AdaptiveSampleStream* stream, double** samples,
                                                              int* count, int* nextIndex,
                                                              KFS_AdaptiveSampleStreamCache* cache);

// What a step does that isn't one inside a segment: finds the segment of x, or that there is none, and answers as the
// step. For KFS_IterateAdaptiveSampleStream alone.
[[nodiscard]] KFS_API int KFS_EnterAdaptiveSampleSegment(double x, double step, double* samples, int count,
                                                         int* nextIndex, KFS_AdaptiveSampleStreamCache* cache,
                                                         double* slope, double* value);

// The value and the slope at x, which must not fall from call to call; either may be null. Before the first sample and
// behind the last one their values hold, with slope 0. `step` is what x grows by from here on, and stays the same within
// a segment. Takes no lock and allocates nothing. Always 0.
//
// Inline, since callers do it for each sample of sound: inside a segment it is an addition.
[[nodiscard]] KFS_API inline int KFS_IterateAdaptiveSampleStream(double x, double step, KFS_AdaptiveSampleStream*,
                                                                 double* samples, int count, int* nextIndex,
                                                                 KFS_AdaptiveSampleStreamCache* cache, double* slope,
                                                                 double* value)
{
    if (!(cache->inSegment && cache->x0 <= x && cache->x1 > x)) [[unlikely]]
        return KFS_EnterAdaptiveSampleSegment(x, step, samples, count, nextIndex, cache, slope, value);
    cache->value += cache->step;
    if (slope) *slope = cache->slope;
    if (value) *value = cache->value;
    return 0;
}

// Ends a walk.
[[nodiscard]] KFS_API int KFS_CompleteIterateAdaptiveSampleStream(KFS_AdaptiveSampleStream* stream);
