/* The tone engine behind the colour effects: a look is a saturation, one
 * tone curve per channel, a radial shade or glow, grain and wear, applied
 * to BGRA pixels in one pass. */
#ifndef PEE_LOOK_H
#define PEE_LOOK_H

#include <cstdint>

#include "effect-kit.h"

namespace pee {

struct Rgb8 {
	uint8_t r, g, b;
};

enum RadialKind {
	RADIAL_NONE,
	/* Blend towards the colour away from the centre: a vignette. */
	RADIAL_SHADE,
	/* Screen the colour over the centre: a glow. */
	RADIAL_GLOW
};

struct Look {
	/* 256 keeps the colours, 0 makes them grey, above 256 boosts them
	 * (up to 320). */
	int saturation = 256;
	kit::CurveShape red, green, blue;
	/* The radial step: its weight goes from nothing to `strength` (0..1)
	 * between the distances `inner` and `outer` from the centre (cx, cy),
	 * for a shade, and the other way round for a glow. Distances are in
	 * units of the middle-to-corner distance. */
	RadialKind radial = RADIAL_NONE;
	float strength = 0.f;
	float inner = 0.f, outer = 1.f;
	float cx = 0.f, cy = 0.f;
	Rgb8 colour{0, 0, 0};
	/* Luminance grain of about +-grain levels on a full-size picture. */
	int grain = 0;
	/* Light flecks and vertical scratches of a worn print. */
	bool worn = false;
};

/* Checks the arguments and applies the look; returns a kit::Result. */
int apply_look(const Look &look, const unsigned char *in, unsigned char *out, int width, int height);

/* The arguments every BGRA effect takes, checked the same way. */
inline bool bgra_arguments_usable(const unsigned char *in, const unsigned char *out, int width, int height)
{
	return in && out && kit::size_usable(width, height);
}

} // namespace pee

#endif
