// The walk along a polyline of samples: the inner loop of whoever reads a stream at audio rate.

#include "curves/adaptivesamples.h"

#include <cmath>

namespace {

// Segments narrower than this, and those that run backwards, have no width.
constexpr double LeastWidth = -1e-12;

void TakeSample(double const* samples, int index, double* x, double* y)
{
    *x = samples[2 * index];
    *y = samples[2 * index + 1];
}

void CloseIfEmpty(KFS_AdaptiveSampleStreamCache* cache)
{
    if (!(cache->x1 - cache->x0 > LeastWidth)) cache->x0 = cache->x1;
}

int Answer(double slope, double value, double* slopeOut, double* valueOut)
{
    if (slopeOut) *slopeOut = slope;
    if (valueOut) *valueOut = value;
    return 0;
}

int AnswerStill(KFS_AdaptiveSampleStreamCache* cache, double held, double* slope, double* value)
{
    cache->slope = 0.0;
    cache->inSegment = false;
    return Answer(0.0, held, slope, value);
}

// Callers that look the function up, or take its address, find it here.
[[gnu::used]] auto* const theStep = &KFS_IterateAdaptiveSampleStream;

}  // namespace

int KFS_InitIterateAdaptiveSampleStream(KFS_AdaptiveSampleStream* stream, double** samples, int* count, int* nextIndex,
                                        KFS_AdaptiveSampleStreamCache* cache)
{
    SEQ_Head** const list = stream->samples;
    if (int const code = SEQ_Lock(1, list)) return code;
    *nextIndex = 0;
    cache->inSegment = false;
    cache->slope = 0.0;
    *count = (*list)->count;
    void* first = nullptr;
    // The pin is taken already; this one only hands the items out.
    if (int const code = SEQ_GetAddress(list, 0, 0, &first)) {
        static_cast<void>(SEQ_Unlock(list));  // the failure above is what the caller hears of
        return code;
    }
    *samples = static_cast<double*>(first);
    TakeSample(*samples, (*nextIndex)++, &cache->x0, &cache->y0);
    cache->x1 = cache->x0;
    cache->y1 = cache->y0;
    if (*nextIndex < *count) TakeSample(*samples, (*nextIndex)++, &cache->x1, &cache->y1);
    return 0;
}

int KFS_EnterAdaptiveSampleSegment(double x, double step, double* samples, int count, int* nextIndex,
                                   KFS_AdaptiveSampleStreamCache* cache, double* slope, double* value)
{
    CloseIfEmpty(cache);
    for (;;) {
        if (cache->x0 > x) return AnswerStill(cache, cache->y0, slope, value);
        if (cache->x1 > x) break;
        if (*nextIndex >= count) return AnswerStill(cache, cache->y1, slope, value);
        cache->x0 = cache->x1;
        cache->y0 = cache->y1;
        TakeSample(samples, (*nextIndex)++, &cache->x1, &cache->y1);
        cache->inSegment = false;
        CloseIfEmpty(cache);
    }
    double const width = cache->x1 - cache->x0;
    if (width == 0.0) return AnswerStill(cache, cache->y1, slope, value);
    double const dy = cache->y1 - cache->y0;
    cache->slope = dy / width;
    cache->value = std::fabs(x - cache->x0) / width * dy + cache->y0;
    cache->step = step / width * dy;
    cache->inSegment = true;
    return Answer(cache->slope, cache->value, slope, value);
}

int KFS_CompleteIterateAdaptiveSampleStream(KFS_AdaptiveSampleStream* stream)
{
    return SEQ_Unlock(stream->samples);
}
