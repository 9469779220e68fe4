#include "host/streambuilder.h"

#include "curves/tangents.h"
#include "frame/frame.h"
#include "host/storeerror.h"
#include "keystore/edit.h"

namespace kfshost {

namespace {

std::unique_ptr<KFS_Stream> MakeStream(int dimension, unsigned int timeScale, std::string const& name)
{
    KFS_ValueDesc description;
    description.dataType = KFS_Type_Double;
    try {
        KFS_MatchName const matchName(name.c_str(), false);
        return std::make_unique<KFS_Stream>(static_cast<short>(dimension), timeScale, false, false, KFS_InterpMask_All,
                                            0, description, &matchName, Get_VX_StreamFactory(), false);
    } catch (int code) {
        throw StoreError(code);
    }
}

}  // namespace

StreamBuilder::StreamBuilder(int dimension, unsigned int timeScale, std::string const& name)
    : stream_(MakeStream(dimension, timeScale, name))
{}

// The value is in the external form, which is doubles here as well: KFS_InsertKey saves the detour of its double form.
void StreamBuilder::Append(int time, double const* value, KFS_Interp inInterp, KFS_Interp outInterp)
{
    T_Time const at{time, stream_->GetTimeScale()};
    ThrowIfFailed(KFS_InsertKey(stream_.get(), &at, false, value, inInterp, outInterp));
}

void StreamBuilder::SetHandles(int index, KeyHandles const& handles)
{
    ThrowIfFailed(KFS_SetKeyVelocityF(stream_.get(), index, handles.inSpeed, handles.outSpeed));
    ThrowIfFailed(KFS_SetKeyInfluence(stream_.get(), index, handles.inInfluence, handles.outInfluence));
}

}  // namespace kfshost
