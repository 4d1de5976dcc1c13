#include "benchmarks/masks/otherrasterisers.h"

#include "benchmarks/masks/bitrun.h"
#include "benchmarks/support/measure.h"

#include <cstring>
#include <memory>

#ifdef KRV_HAVE_CAIRO
#include <cairo.h>
#endif
#ifdef KRV_HAVE_AGG
#include <agg_gamma_functions.h>
#include <agg_rasterizer_scanline_aa.h>
#include <agg_scanline_bin.h>
#endif

namespace krv::benchmarks
{

std::function<void()> CairoFill([[maybe_unused]] const Rings& oRings, [[maybe_unused]] int nSize)
{
#ifdef KRV_HAVE_CAIRO
    const auto poSurface = std::shared_ptr<cairo_surface_t>(cairo_image_surface_create(CAIRO_FORMAT_A1, nSize, nSize),
                                                            &cairo_surface_destroy);
    return [poSurface, nSize, &oRings]
    {
        const auto poCairo = std::shared_ptr<cairo_t>(cairo_create(poSurface.get()), &cairo_destroy);
        cairo_set_antialias(poCairo.get(), CAIRO_ANTIALIAS_NONE);
        std::memset(cairo_image_surface_get_data(poSurface.get()), 0,
                    static_cast<std::size_t>(cairo_image_surface_get_stride(poSurface.get())) *
                        static_cast<std::size_t>(nSize));
        cairo_surface_mark_dirty(poSurface.get());
        cairo_set_fill_rule(poCairo.get(), CAIRO_FILL_RULE_EVEN_ODD);
        for (const auto& oRing : oRings)
        {
            cairo_move_to(poCairo.get(), oRing.front().x, oRing.front().y);
            for (const GDBVertex& oVertex : oRing)
                cairo_line_to(poCairo.get(), oVertex.x, oVertex.y);
            cairo_close_path(poCairo.get());
        }
        cairo_set_source_rgba(poCairo.get(), 0, 0, 0, 1);
        cairo_fill(poCairo.get());
        cairo_surface_flush(poSurface.get());
        Keep(cairo_image_surface_get_data(poSurface.get()));
    };
#else
    return {};
#endif
}

std::function<void()> AggFill([[maybe_unused]] const Rings& oRings, [[maybe_unused]] int nSize)
{
#ifdef KRV_HAVE_AGG
    const auto nWidth = static_cast<std::uint64_t>(nSize);
    const auto poBits = std::make_shared<std::vector<unsigned char>>(nWidth * nWidth / 8);
    return [poBits, nWidth, &oRings]
    {
        std::fill(poBits->begin(), poBits->end(), static_cast<unsigned char>(0));
        // Its usual limit of cells would leave a part of the dense outlines out.
        agg::rasterizer_scanline_aa<> oRasteriser(1u << 20);
        oRasteriser.filling_rule(agg::fill_even_odd);
        oRasteriser.gamma(agg::gamma_threshold(0.5));
        for (const auto& oRing : oRings)
        {
            oRasteriser.move_to_d(oRing.front().x, oRing.front().y);
            for (const GDBVertex& oVertex : oRing)
                oRasteriser.line_to_d(oVertex.x, oVertex.y);
            oRasteriser.close_polygon();
        }
        agg::scanline_bin oLine;
        if (!oRasteriser.rewind_scanlines())
            return;
        oLine.reset(oRasteriser.min_x(), oRasteriser.max_x());
        while (oRasteriser.sweep_scanline(oLine))
        {
            auto oSpan = oLine.begin();
            for (unsigned int i = 0; i < oLine.num_spans(); ++i, ++oSpan)
            {
                const std::uint64_t nFrom =
                    static_cast<std::uint64_t>(oLine.y()) * nWidth + static_cast<std::uint64_t>(oSpan->x);
                SetBitRun(poBits->data(), nFrom, nFrom + static_cast<std::uint64_t>(oSpan->len) - 1);
            }
        }
        Keep(poBits->data());
    };
#else
    return {};
#endif
}

} // namespace krv::benchmarks
