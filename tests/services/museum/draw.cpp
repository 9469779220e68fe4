// draw_museum > museum.svg: every exhibit with its handles, its points at even t, and, filled, at even distances.
#include "tests/services/museum/museum.h"

#include "frame/services/sequence.h"

#include <algorithm>
#include <cstdio>

int main()
{
    constexpr double Side = 190, Gap = 50;
    constexpr std::size_t Columns = 6;
    double const height = static_cast<double>((Museum.size() + Columns - 1) / Columns) * (Side + Gap);
    std::printf("<svg xmlns='http://www.w3.org/2000/svg' viewBox='-20 -30 %g %g' font-family='sans-serif' "
                "font-size='8'><rect x='-20' y='-30' width='100%%' height='100%%' fill='white'/>\n",
                Columns * (Side + Gap) + 20, height + 20);
    for (std::size_t index = 0; index < Museum.size(); ++index) {
        Curve curve = Museum[index].curve;
        if (curve.dimension == 1) {
            curve.dimension = 2;
            for (std::size_t i = 0; i < 4; ++i) curve.p[i] = {static_cast<double>(i), curve.p[i][0]};
        }
        double low[2], high[2];
        for (std::size_t k = 0; k < 2; ++k) {
            auto const [least, most] = std::minmax({curve.p[0][k], curve.p[1][k], curve.p[2][k], curve.p[3][k]});
            low[k] = least;
            high[k] = most > least ? most : least + 1;
        }
        auto const x = [&](double const* point) { return (point[0] - low[0]) / (high[0] - low[0]) * Side; };
        auto const y = [&](double const* point) { return (high[1] - point[1]) / (high[1] - low[1]) * Side; };
        std::printf("<g transform='translate(%g %g)'><text y='-8'>%s</text>\n",
                    static_cast<double>(index % Columns) * (Side + Gap),
                    static_cast<double>(index / Columns) * (Side + Gap), Museum[index].name);
        for (std::size_t end : {0, 2})
            std::printf("<line x1='%g' y1='%g' x2='%g' y2='%g' stroke='#aaa'/>\n", x(curve.p[end].data()),
                        y(curve.p[end].data()), x(curve.p[end + 1].data()), y(curve.p[end + 1].data()));
        CRV_Curve const kernel = curve.Get();
        double point[4];
        std::printf("<polyline fill='none' stroke='#06c' points='");
        for (int i = 0; i <= 200 && CRV_EvaluatePoint(&kernel, point, i / 200.0) == 0; ++i)
            std::printf("%g,%g ", x(point), y(point));
        std::printf("'/>\n");
        SEQ_Head** table = nullptr;
        double length = 0, t = 0;
        if (CRV_BuildArcSpline(&kernel, &table, &length, 1e-4) != 0) return 1;
        for (int i = 0; i <= 16; ++i) {  // a picture to look at: what can't be drawn is seen to be missing
            static_cast<void>(CRV_EvaluatePoint(&kernel, point, i / 16.0));
            std::printf("<circle cx='%g' cy='%g' r='3' fill='none' stroke='#06c'/>", x(point), y(point));
            static_cast<void>(CRV_TFromSSpline(&kernel, &table, &t, length * i / 16, 1.0));
            static_cast<void>(CRV_EvaluatePoint(&kernel, point, t));
            std::printf("<circle cx='%g' cy='%g' r='1.7' fill='#c30'/>\n", x(point), y(point));
        }
        static_cast<void>(SEQ_Dispose(table, 0));
        std::printf("</g>\n");
    }
    std::printf("</svg>\n");
}
