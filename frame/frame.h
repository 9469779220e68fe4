#pragma once

#include "frame/errors.h"
#include "frame/export.h"
#include "frame/services/identifiers.h"

class GetRenderGuidFilter;
class KFS_ParamLayerStream;
class KFS_ParamPathStream;
class KFS_RenderOptionsBase;
class KFS_StreamFactory;
class KFS_StreamIDPath;

// What the library asks of its application. Apart from oldPathFixupFunc, an entry is called without a look whether it is
// null: the host sets all those that its streams need before it uses them.
struct KFS_AppCallbacks {
    // An old file stored a type number in place of a path: fills the path in. If null, the path stays as read.
    void (*oldPathFixupFunc)(int oldType, KFS_StreamIDPath* path) = nullptr;
    // The layer that a stream has by default: what a layer parameter holds, so null for none.
    void* (*layerDefaultValueFunc)(KFS_ParamLayerStream const* stream) = nullptr;
    // The flat number of a stream's layer, or the layer of its flat number.
    long (*layerIndependentFunc)(KFS_ParamLayerStream const* stream, bool independent) = nullptr;
    hearth::utility::Guid (*layerRenderGuidFunc)(KFS_ParamLayerStream const* stream,
                                                 KFS_RenderOptionsBase const& options,
                                                 GetRenderGuidFilter* filter) = nullptr;
    int (*pathIndependentFunc)(KFS_ParamPathStream const* stream, bool independent) = nullptr;
    hearth::utility::Guid (*pathRenderGuidFunc)(KFS_ParamPathStream const* stream, KFS_RenderOptionsBase const& options,
                                                GetRenderGuidFilter* filter) = nullptr;
};

// Bracket all use of the library: make and destroy the default stream factory and what the tree shares. On the main
// thread. 0 or an error code; a failed Birth is followed by Death as well.
//
// Libkfs reaches into its own services where a read can't afford a call. Loaded with others, Birth reports that and answers
// KFS_Err_ForeignServices; built with KFS_FOREIGN_SERVICES it uses their operations only, and takes any.
inline constexpr int KFS_Err_ForeignServices = 7447;
[[nodiscard]] KFS_API int KFS_Birth();
[[nodiscard]] KFS_API int KFS_Death();

// After KFS_Birth and before KFS_Death. The six entries are copied.
KFS_API void KFS_SetCallbacks(KFS_AppCallbacks& callbacks);
KFS_API void KFS_ClearCallbacks();

// The default factory; null outside KFS_Birth .. KFS_Death. Owned by the library.
KFS_API KFS_StreamFactory* Get_VX_StreamFactory();
