#pragma once

#include "frame/export.h"
#include "frame/services/time.h"
#include "keystore/stream.h"

// Two edits of whole shapes: a curve dragged by one of its points, and a stream taken over by one of another dimension.

// Drags the curve between two keys by the point at a time. The handles on both sides of the segment move so that the curve
// passes through the new point; the keys stay where they are.
//
//   time       its value counts as it stands, in the stream's scale; its own scale isn't looked at
//   spatial    zero: the temporal curve of a plain stream. Non-zero: the path of a spatial one, of dimension 2.
//   dimension  of a temporal drag: the component to drag, or -1 for all of them
//   target     of a temporal drag: by how much each component's value at the time is to change, `dimension` of the stream
//              numbers; read only where dragged. Of a path: the point's new coordinates, two numbers.
//
// Temporal: both sides of the segment become splines, whatever the stream's mask says, and the handles the user's
// (KFS_KeyFlag_Modifiable goes out). A side that wasn't a spline first gets the handle that the getters have answered for
// it (curves/tangents.h), so that a linear segment begins as the line that it was; a segment that held can't begin as it
// was, but comes to pass through the held value and the change. How handles move, and when their lengths change, is the
// curve kernel's affair (CRV_DirectManipCurve). A continuous key's other side turns along, and with it the curve there.
//
// The trap: with one component chosen, each other component gets the handles that the chosen one had before the drag. To
// drag one component and leave the others, drag all with a change of 0 for the others.
//
// Spatial: the two keys are those around the point on the path, float keys included, and their tangents become the
// user's. The path is drawn through the new point; when the stream passes there follows from the speed graph and the arcs'
// new lengths. A stream without automatic tangents (spInterp) goes straight from key to key and doesn't show its path.
//
// The stream is brought up to date first. The setters of the two keys notify one after the other.
//
// Operation 98. Result: 0, or
//   2                    the stream is damaged
//   7427 KFS_Err_NoKeys  no key, or a constant without a value
//   7440 KFS_Err_ArcLength2D  a path that isn't one of dimension 2, or of custom values; and temporally a stream that is
//                        spatial or custom, or a component that it doesn't have: "can't directly manipulate this stream".
//                        After the first of these the key list stays pinned, as it always has.
//   7442 KFS_Err_TimeOutsideKeys  the time doesn't lie between two keys: before the first, after the last or on
//                        one; reported with operation 100. Nothing was written.
//   CRV_Err_OutOfReach   no handles carry the curve there: a stream with KFS_StreamFlag_NonDecreasing would have to turn
//                        back, or the path stands still at the time
//   the curve kernel's, with the sides turned into splines; the list service's, as for a constant; a listener's
// Threads: main thread. Cost: a search, a solve a component, the two setters.
[[nodiscard]] KFS_API int KFS_DirectManipArc(KFS_Stream* stream, T_Time* time, unsigned char spatial, int dimension,
                                             double const* target);

// Fills a stream with the keys of another one, where both have dimension 2 or 3: values, handles, codes, flags, and the
// settings of a path.
//
//   newDimension  2 or 3; plays no part beyond that: the destination's dimension counts
//   fillValue     of the components that the source doesn't have; they rest
//   destination   in; made by the caller. Its flags become the source's, so that it is keyed, constant or spatial as the
//                 source is; keys and a value that don't fit that are gone. What has a place stays: keys at other times
//                 than the source's end in a mixture that nobody wants.
//
// Times are converted to the destination's scale. A constant's value arrives at time 0.
//
// Operation 106. Result: 0, or
//   2                              a damaged stream, the source's before the destination's
//   7443 KFS_Err_Only2D3D          a dimension other than 2 and 3
//   7445 KFS_Err_CustomNotAllowed  a custom stream
//   7427 KFS_Err_NoKeys            a constant without a value
//   of reading and setting keys, with the keys made so far in the destination
// Threads: main thread. Notifies as the setters do, key by key.
[[nodiscard]] KFS_API int KFS_ConvertStreamDim(short newDimension, double fillValue, KFS_Stream const* source,
                                               KFS_Stream* destination);
