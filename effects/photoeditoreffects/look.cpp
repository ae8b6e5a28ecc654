#include "look.h"

#include <array>
#include <optional>
#include <utility>

namespace pee {
namespace {

enum Feature : unsigned {
	SATURATION = 1,
	RADIAL = 2,
	GRAIN = 4,
	WORN = 8,
	/* Saturation 0: every channel is the luma. */
	MONO = 16
};

/* The radial step is folded into the tone curves: one set of curves per
 * weight level, the level picked per pixel. The level is dithered by the
 * position hash, so 32 levels show no bands. */
constexpr int LEVELS = 32;
constexpr int LEVEL_FRACTION = 16;
/* Saturation and grain may carry a channel past 0..255; the curves are
 * extended by CURVE_PAD on both sides to take it, so that no clamp is
 * needed. A boost of MAX_SATURATION reaches 64 beyond the range, grain
 * GRAIN_PAD more. */
constexpr int MAX_SATURATION = 320;
constexpr int GRAIN_PAD = 48;
constexpr int CURVE_PAD = (MAX_SATURATION - 256) * 255 / 256 + 1 + GRAIN_PAD;
constexpr int CURVE_SPAN = 256 + 2 * CURVE_PAD;

struct LevelCurves {
	uint8_t map[LEVELS][3][CURVE_SPAN];
};

struct Scratch {
	int x;
	int strength;
};

/* Everything the pixel loop reads, held in locals: byte stores may alias
 * anything else, and would make the compiler reload it for every pixel. */
struct Kernel {
	const LevelCurves *curves;
	int saturation;
	const int32_t *radial_row, *radial_column;
	/* Radial distance to level, in 1/LEVEL_FRACTION of a level. */
	const uint16_t *level_of;
	/* Grain values and dither values, and where each row starts reading
	 * them. */
	const int32_t *grain, *dither, *strip_start;
	const std::vector<Scratch> *scratches;
};

/* Values of a position hash laid out as a strip that each row reads from
 * a hashed starting point: the same texture as hashing every pixel, for
 * the cost of one load. */
struct Strip {
	static constexpr int SPAN = 4096;
	std::vector<int32_t> grain, dither, start;

	Strip(int width, int height, int amplitude)
		: grain(size_t(SPAN + width)), dither(size_t(SPAN + width)), start(size_t(height))
	{
		for (size_t i = 0; i < grain.size(); ++i) {
			uint32_t h = kit::hash2(uint32_t(i), 0, 0x6a1);
			grain[i] = (int(h >> 24) - 128) * amplitude >> 7;
			dither[i] = int32_t((h >> 4) % LEVEL_FRACTION);
		}
		for (int y = 0; y < height; ++y)
			start[size_t(y)] = int32_t(kit::hash2(0, uint32_t(y), 0x6a2) % SPAN);
	}
};

/* The columns of a worn print that carry a scratch: a few only. */
std::vector<Scratch> scratch_columns(int width)
{
	std::vector<Scratch> scratches;
	for (int x = 0; x < width; ++x) {
		uint32_t h = kit::hash2(uint32_t(x), 0, 0x5c7a);
		if ((h & 0x3ff) < 3)
			scratches.push_back({x, int(40 + (h >> 26))});
	}
	return scratches;
}

/* Light flecks and scratches, sparse enough to be drawn after the row. */
void brighten(unsigned char *px, int amount)
{
	for (int c = 0; c < 3; ++c)
		px[c] = uint8_t(px[c] + ((255 - px[c]) * amount >> 8));
}

void wear_row(const Kernel &kernel, unsigned char *row, int width, int y)
{
	for (const Scratch &scratch : *kernel.scratches) {
		if (kit::hash2(uint32_t(scratch.x), uint32_t(y) >> 5, 0x5c7a) & 3)
			brighten(row + size_t(scratch.x) * 4, scratch.strength);
	}
	/* Flecks are 2x2 blocks wherever the hash of the block is rare. */
	const uint32_t block_y = uint32_t(y) >> 1;
	for (int x = 0; x < width; x += 2) {
		if ((kit::hash2(uint32_t(x) >> 1, block_y, 0xd057) & 0xfff) < 2) {
			brighten(row + size_t(x) * 4, 90);
			if (x + 1 < width)
				brighten(row + size_t(x + 1) * 4, 90);
		}
	}
}

/* One pass over the picture, every step fused per pixel; the features are
 * template flags so that each look runs only the steps it uses. */
template <unsigned FEATURES>
void run(const Kernel &k, const unsigned char *in, unsigned char *out, int width, int height)
{
	const Kernel kernel = k;
	for (int y = 0; y < height; ++y) {
		size_t row = size_t(y) * size_t(width) * 4;
		const unsigned char *src = in + row;
		unsigned char *dst = out + row;
		const int32_t radial_y = (FEATURES & RADIAL) ? kernel.radial_row[y] : 0;
		const int32_t start = (FEATURES & (GRAIN | RADIAL)) ? kernel.strip_start[y] : 0;
		const int32_t *noise = (FEATURES & GRAIN) ? kernel.grain + start : nullptr;
		const int32_t *dither = (FEATURES & RADIAL) ? kernel.dither + start : nullptr;
		for (int x = 0; x < width; ++x, src += 4, dst += 4) {
			int b = src[0], g = src[1], r = src[2];
			if (FEATURES & MONO) {
				r = g = b = kit::luma(r, g, b);
			} else if (FEATURES & SATURATION) {
				int l = kit::luma(r, g, b);
				r = l + ((r - l) * kernel.saturation >> 8);
				g = l + ((g - l) * kernel.saturation >> 8);
				b = l + ((b - l) * kernel.saturation >> 8);
			}
			int level = 0;
			if (FEATURES & RADIAL) {
				int d = std::min(kit::RADIAL_CAP, radial_y + kernel.radial_column[x]);
				level = (kernel.level_of[d] + dither[x]) / LEVEL_FRACTION;
			}
			const auto &curves = kernel.curves->map[level];
			const int n = (FEATURES & GRAIN) ? noise[x] + CURVE_PAD : CURVE_PAD;
			dst[0] = curves[2][b + n];
			dst[1] = curves[1][g + n];
			dst[2] = curves[0][r + n];
			dst[3] = 255;
		}
		if (FEATURES & WORN)
			wear_row(kernel, out + row, width, y);
	}
}

using Runner = void (*)(const Kernel &, const unsigned char *, unsigned char *, int, int);

template <unsigned... F>
constexpr auto make_runners(std::integer_sequence<unsigned, F...>)
{
	return std::array<Runner, sizeof...(F)>{&run<F>...};
}

constexpr auto RUNNERS = make_runners(std::make_integer_sequence<unsigned, 32>{});

/* Weight (0..1 of the strength) of the radial step at a distance. */
float radial_weight(const Look &look, float distance)
{
	float s = kit::smoothstep(look.inner, look.outer, distance);
	return look.radial == RADIAL_GLOW ? 1.f - s : s;
}

void build_curves(const Look &look, LevelCurves *curves)
{
	const kit::Curve base[3] = {kit::make_curve(look.red), kit::make_curve(look.green),
				    kit::make_curve(look.blue)};
	const float colour[3] = {float(look.colour.r), float(look.colour.g), float(look.colour.b)};
	for (int level = 0; level < LEVELS; ++level) {
		float w = look.strength * float(level) / float(LEVELS - 1);
		for (int c = 0; c < 3; ++c) {
			for (int i = 0; i < CURVE_SPAN; ++i) {
				int v = i - CURVE_PAD;
				float t = base[c].map[std::clamp(v, 0, 255)] + float(v - std::clamp(v, 0, 255));
				if (look.radial == RADIAL_SHADE)
					t += (colour[c] - t) * w;
				else if (look.radial == RADIAL_GLOW)
					t += (255.f - t) * colour[c] / 255.f * w;
				curves->map[level][c][i] = kit::clamp_byte(t);
			}
		}
	}
}

} // namespace

int apply_look(const Look &look, const unsigned char *in, unsigned char *out, int width, int height)
{
	if (!bgra_arguments_usable(in, out, width, height))
		return kit::RESULT_BAD_ARGUMENT;
	return kit::guarded([&] {
		auto curves = std::make_unique<LevelCurves>();
		build_curves(look, curves.get());
		const int saturation = std::clamp(look.saturation, 0, MAX_SATURATION);
		Kernel kernel{curves.get(), saturation, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr};
		unsigned features = 0;
		if (saturation == 0)
			features |= MONO;
		else if (saturation != 256)
			features |= SATURATION;

		std::optional<kit::Radial> radial;
		std::vector<uint16_t> level_of;
		if (look.radial != RADIAL_NONE) {
			radial.emplace(width, height, look.cx, look.cy);
			level_of.resize(kit::RADIAL_CAP + 1);
			for (int d = 0; d <= kit::RADIAL_CAP; ++d) {
				float distance = std::sqrt(float(d) / 256.f);
				level_of[size_t(d)] = uint16_t(radial_weight(look, distance) * float((LEVELS - 1) * LEVEL_FRACTION));
			}
			kernel.radial_row = radial->row.data();
			kernel.radial_column = radial->column.data();
			kernel.level_of = level_of.data();
			features |= RADIAL;
		}
		/* Grain is per pixel: on a small picture (a thumbnail) the same
		 * amplitude would read as noise rather than texture. */
		const float grain_scale = std::clamp(float(std::max(width, height)) / 1280.f, 0.3f, 1.f);
		const int grain = std::min(GRAIN_PAD, int(float(look.grain) * grain_scale));
		std::optional<Strip> strip;
		if (grain || look.radial != RADIAL_NONE) {
			strip.emplace(width, height, grain);
			kernel.grain = strip->grain.data();
			kernel.dither = strip->dither.data();
			kernel.strip_start = strip->start.data();
			if (grain)
				features |= GRAIN;
		}
		std::vector<Scratch> scratches;
		if (look.worn) {
			scratches = scratch_columns(width);
			kernel.scratches = &scratches;
			features |= WORN;
		}
		RUNNERS[features](kernel, in, out, width, height);
		return int(kit::RESULT_OK);
	});
}

} // namespace pee
