// draw_museum > museum.svg: every exhibit with its handles and the kernel's points, open at even t and filled at even
// distances.
#include "tests/services/museum/museum.h"

#include "frame/services/sequence.h"

#include <algorithm>
#include <cstdio>

int main()
{
    std::printf("<svg xmlns='http://www.w3.org/2000/svg' viewBox='-20 -30 1460 2200' font-size='8'>\n");
    for (std::size_t index = 0; index < Museum.size(); ++index) {
        Curve curve = Museum[index].curve;
        for (std::size_t i = 0; i < 4 && curve.dimension == 1; ++i)
            curve.p[i] = {static_cast<double>(i), curve.p[i][0]};
        curve.dimension = std::max<short>(curve.dimension, 2);
        double low[2], size[2];
        for (std::size_t k = 0; k < 2; ++k) {
            auto const [least, most] = std::minmax({curve.p[0][k], curve.p[1][k], curve.p[2][k], curve.p[3][k]});
            low[k] = least;
            size[k] = most > least ? most - least : 1;
        }
        auto const put = [&](char const* format, double const* at) {
            std::printf(format, (at[0] - low[0]) / size[0] * 190, 190 - (at[1] - low[1]) / size[1] * 190);
        };
        std::printf("<g fill='none' stroke='#888' transform='translate(%zu %zu)'><text y='-8'>%s</text><path d='",
                    index % 6 * 240, index / 6 * 240, Museum[index].name);
        for (std::size_t i = 0; i < 4; ++i) put(i % 2 ? "L%g %g" : "M%g %g", curve.p[i].data());
        std::printf("'/>\n");
        CRV_Curve const kernel = curve.Get();
        SEQ_Head** table = nullptr;
        double point[4], length = 0, t = 0;
        if (CRV_BuildArcSpline(&kernel, &table, &length, 1e-4) != 0) return 1;
        for (int i = 0; i <= 64; ++i) {
            if (CRV_EvaluatePoint(&kernel, point, i / 64.0) != 0) return 1;
            put("<circle cx='%g' cy='%g' r='2' stroke='#06c'/>", point);
            if (CRV_TFromSSpline(&kernel, &table, &t, length * i / 64, 1.0) != 0) return 1;
            if (CRV_EvaluatePoint(&kernel, point, t) != 0) return 1;
            put("<circle cx='%g' cy='%g' r='1' fill='#c30'/>\n", point);
        }
        if (SEQ_Dispose(table, 0) != 0) return 1;
        std::printf("</g>\n");
    }
    std::printf("</svg>\n");
}
