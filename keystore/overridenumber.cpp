// What a bag gives in place of a typed stream's number. Apart from derivedstream.h, whose users needn't know bags.

#include "keystore/derivedstream.h"
#include "overrides/parambag.h"

void KFS_ExtractOverrideNumber(KFS_Stream const* stream, KFS_EvalData const& eval, double*& value)
{
    if (!eval.bag || eval.bag->GetOverrideCount() == 0) return;
    KFS_OverrideValue given;
    if (!eval.bag->StreamOverridden(stream, eval.time, &given)) return;
    auto const& numbers = boost::get<std::vector<double>>(given);
    if (numbers.empty()) throw boost::bad_get();
    value = new double(numbers.front());
}
