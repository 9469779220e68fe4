#include "frame/services/time.h"
#include "tree/matchname.h"

#include <cstdio>
#include <cstring>

// Both libraries, through their headers and at run time: a name goes into the pool and comes back, and a time is converted.
int main()
{
    KFS_MatchName const name("consumer position", false);
    int frames = 0;
    bool const right = std::strcmp(reinterpret_cast<char const*>(name.GetName()), "consumer position") == 0 &&
                       T_ShortConvTime(3, 2, 24, &frames) == 0 && frames == 36;
    std::puts(right ? "the installed library answers" : "the installed library answers wrongly");
    return right ? 0 : 1;
}
