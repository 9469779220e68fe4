# Headers of others that most files here include are parsed once for each target, with KFS_PRECOMPILE. Our own headers
# aren't among them, so that an edit compiles no more than before. Builds without it (release, with warnings as errors) see
# whether a file includes all that it needs.

set(kfsCommonHeaders
    <algorithm> <array> <cstring> <functional> <map> <memory> <mutex> <optional> <set> <span> <string> <string_view> <vector>
    <boost/any.hpp> <boost/function.hpp> <boost/make_shared.hpp> <boost/shared_ptr.hpp>)

# kfs_precompile(<target> [header...]): the common headers and these.
function(kfs_precompile target)
    if(KFS_PRECOMPILE)
        target_precompile_headers(${target} PRIVATE ${kfsCommonHeaders} ${ARGN})
    endif()
endfunction()
