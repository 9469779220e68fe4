#include <kfs.h>

#include <cstdio>
#include <cstring>

// Both libraries, through their headers and at run time: the library starts, a name comes back, a time is converted.
int main()
{
    if (KFS_Birth() != 0 || !Get_VX_StreamFactory()) return 1;
    KFS_MatchName const name("consumer position", false);
    int frames = 0;
    bool const right = std::strcmp(reinterpret_cast<char const*>(name.GetName()), "consumer position") == 0 &&
                       T_ShortConvTime(3, 2, 24, &frames) == 0 && frames == 36;
    std::puts(right ? "the installed library answers" : "the installed library answers wrongly");
    return KFS_Death() == 0 && right ? 0 : 1;
}
