/* The artistic effects behind IEL_Apply_Effect. Each reads width x height
 * RGB888 pixels (red first) and writes as many; arguments are checked by
 * the caller. They return a kit::Result. */
#ifndef PEE_ENGINE_EFFECTS_H
#define PEE_ENGINE_EFFECTS_H

#include <cstdint>

#include "effect-kit.h"

namespace pee {

/* Strength chosen by the option value: 1 light, 2 medium, 3 strong. */
enum Weight { WEIGHT_LIGHT = 1, WEIGHT_MEDIUM = 2, WEIGHT_STRONG = 3 };

int magic_pen(const uint8_t *in, uint8_t *out, int width, int height);
int cartoon(const uint8_t *in, uint8_t *out, int width, int height, Weight outline);
int oil_paint(const uint8_t *in, uint8_t *out, int width, int height);
/* `texture` holds width x height BGRA pixels of paper with hatching. */
int sketch(const uint8_t *in, const uint8_t *texture, uint8_t *out, int width, int height, Weight pencil);

inline kit::Plane luma_rgb888(const uint8_t *px, int width, int height)
{
	kit::Plane y(width, height);
	for (size_t i = 0; i < y.v.size(); ++i, px += 3)
		y.v[i] = 0.299f * px[0] + 0.587f * px[1] + 0.114f * px[2];
	return y;
}

inline kit::Rgb read_rgb888(const uint8_t *px, int width, int height)
{
	return kit::read_rgb(px, width, height, 3, 0, 1, 2);
}

inline void write_rgb888(const kit::Rgb &rgb, uint8_t *px)
{
	kit::write_rgb(rgb, px, 3, 0, 1, 2);
}

} // namespace pee

#endif
