#include "host/streambuilder.h"

#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "frame/frame.h"
#include "host/storeerror.h"
#include "keystore/attributes.h"
#include "keystore/edit.h"

#include <cmath>
#include <vector>

namespace kfshost {

namespace {

// A path bends where its tangents say so, and is measured by distance: both need the automatic spatial setting.
std::unique_ptr<KFS_Stream> MakeStream(int dimension, unsigned int timeScale, std::string const& name, StreamForm form)
{
    bool const isPath = form == StreamForm::Path;
    unsigned short const spInterpMask = isPath ? KFS_InterpMask_Negative : 0;
    KFS_ValueDesc description;
    description.dataType = KFS_Type_Double;
    try {
        KFS_MatchName const matchName(name.c_str(), false);
        return std::make_unique<KFS_Stream>(static_cast<short>(dimension), timeScale, false, isPath, KFS_InterpMask_All,
                                            spInterpMask, description, &matchName, Get_VX_StreamFactory(), false);
    } catch (int code) {
        throw StoreError(code);
    }
}

std::unique_ptr<KFS_Stream> MakeChannel(StreamKind kind, int dimension, unsigned int timeScale, StreamForm form)
{
    try {
        return std::make_unique<ChannelStream>(kind, static_cast<short>(dimension), timeScale, form, false,
                                               Get_VX_StreamFactory(), false);
    } catch (int code) {
        throw StoreError(code);
    }
}

}  // namespace

StreamBuilder::StreamBuilder(int dimension, unsigned int timeScale, std::string const& name, StreamForm form)
    : stream_(MakeStream(dimension, timeScale, name, form))
{}

StreamBuilder::StreamBuilder(StreamKind kind, int dimension, unsigned int timeScale, StreamForm form)
    : stream_(MakeChannel(kind, dimension, timeScale, form))
{}

// The value is in the external form, which is doubles here as well: KFS_InsertKey saves the detour of its double form.
void StreamBuilder::Append(int time, double const* value, KFS_Interp inInterp, KFS_Interp outInterp)
{
    T_Time const at{time, stream_->GetTimeScale()};
    ThrowIfFailed(KFS_InsertKey(stream_.get(), &at, false, value, inInterp, outInterp));
}

void StreamBuilder::Append(std::span<int const> times, std::span<double const> values, KFS_Interp code,
                           KeyHandles const& handles)
{
    std::vector<char> const codes(times.size(), code);
    KFS_NewKeys const keys{static_cast<int>(times.size()),
                           times.data(),
                           stream_->GetTimeScale(),
                           values.data(),
                           codes.data(),
                           codes.data(),
                           handles.inSpeed,
                           handles.inInfluence,
                           handles.outSpeed,
                           handles.outInfluence};
    ThrowIfFailed(KFS_InsertKeys(stream_.get(), &keys, false));
}

void StreamBuilder::SetHandles(int index, KeyHandles const& handles)
{
    ThrowIfFailed(KFS_SetKeyVelocityF(stream_.get(), index, handles.inSpeed, handles.outSpeed));
    ThrowIfFailed(KFS_SetKeyInfluence(stream_.get(), index, handles.inInfluence, handles.outInfluence));
}

void StreamBuilder::SetPathTangents(int index, double const* in, double const* out)
{
    ThrowIfFailed(KFS_SetKeySpaceTangentsF(stream_.get(), index, -1, in, out));
}

// The stream holds the square of what it is told, and measures paths to that square.
void StreamBuilder::SetPathAccuracy(double distance)
{
    double const root = std::sqrt(distance);
    ThrowIfFailed(KFS_SetStreamAccuracy(stream_.get(), &root, nullptr));
}

}  // namespace kfshost
