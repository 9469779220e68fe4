#pragma once

#include "frame/export.h"
#include "frame/services/memory.h"

// The registry of stream kinds.
class KFS_API KFS_StreamFactory : public Q_MemTrackedObject {
public:
    KFS_StreamFactory() = default;
    virtual ~KFS_StreamFactory();
    KFS_StreamFactory(KFS_StreamFactory const&) = delete;
    KFS_StreamFactory& operator=(KFS_StreamFactory const&) = delete;
};
