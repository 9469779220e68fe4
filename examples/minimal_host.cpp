// The least that a host does: start, a property with keys, values between them, stop.

#include "host/session.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"

#include <cstdio>

int main()
{
    kfshost::Session const session;  // KFS_Birth, the callbacks, and a project that reads find; undone at the end

    KFS_ValueDesc description;
    description.dataType = KFS_Type_Double;
    KFS_MatchName const name("opacity", false);
    KFS_Stream opacity(1, 24, false, false, KFS_InterpMask_All, 0, description, &name, nullptr, false);

    double const keys[][2] = {{0, 0.0}, {12, 100.0}, {24, 40.0}};  // frames at 24 a second, and values
    for (auto const& [frame, value] : keys) {
        T_Time const time{static_cast<int>(frame), 24};
        if (int const error = KFS_InsertKeyF(&opacity, &time, false, &value, KFS_Interp_Linear, KFS_Interp_Linear)) {
            std::fprintf(stderr, "no key: error %d\n", error);
            return 1;
        }
    }
    for (int frame = 0; frame <= 24; frame += 6) {
        T_Time const time{frame, 24};
        double value = 0.0;
        if (int const error = KFS_GetValueFPlus(&opacity, &time, 0, &value, nullptr, nullptr)) {
            std::fprintf(stderr, "no value: error %d\n", error);
            return 1;
        }
        std::printf("frame %2d: %g\n", frame, value);
    }
    return 0;
}
