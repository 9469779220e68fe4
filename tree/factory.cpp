#include "tree/factory.h"

KFS_StreamFactory::~KFS_StreamFactory() = default;
