#include "look.h"

#include <array>
#include <climits>
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
	/* A gather reads four bytes from the last entry. */
	uint8_t gather_slack[3];
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
	const int32_t *level_of;
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

/* Whether the 2 x 2 block (bx, by) carries a fleck: where its hash is rare. */
inline bool fleck_at(uint32_t bx, uint32_t by)
{
	return (kit::hash2(bx, by, 0xd057) & 0xfff) < 2;
}

/* The blocks of one block row that carry a fleck, by their first column. */
void fleck_blocks_reference(int width, uint32_t by, std::vector<int> *flecks)
{
	for (int x = 0; x < width; x += 2)
		if (fleck_at(uint32_t(x) >> 1, by))
			flecks->push_back(x);
}

#if KIT_X86
#pragma GCC push_options
#pragma GCC target("avx2")
/* The same hash eight blocks at a time. */
void fleck_blocks_avx2(int width, uint32_t by, std::vector<int> *flecks)
{
	const int blocks = (width + 1) / 2;
	const __m256i row_part = _mm256_set1_epi32(int(by * 0xd8163841u ^ 0xd057u * 0xcb1ab31fu));
	const __m256i column_factor = _mm256_set1_epi32(int(0x8da6b343u));
	const __m256i mix1 = _mm256_set1_epi32(0x2c1b3c6d), mix2 = _mm256_set1_epi32(0x297a2d39);
	const __m256i rare = _mm256_set1_epi32(2), low_bits = _mm256_set1_epi32(0xfff);
	__m256i bx = _mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7);
	int b = 0;
	for (; b + 8 <= blocks; b += 8, bx = _mm256_add_epi32(bx, _mm256_set1_epi32(8))) {
		__m256i h = _mm256_xor_si256(_mm256_mullo_epi32(bx, column_factor), row_part);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 15));
		h = _mm256_mullo_epi32(h, mix1);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 12));
		h = _mm256_mullo_epi32(h, mix2);
		h = _mm256_xor_si256(h, _mm256_srli_epi32(h, 15));
		unsigned hits = unsigned(_mm256_movemask_ps(_mm256_castsi256_ps(
			_mm256_cmpgt_epi32(rare, _mm256_and_si256(h, low_bits)))));
		for (; hits; hits &= hits - 1)
			flecks->push_back(2 * (b + __builtin_ctz(hits)));
	}
	for (; b < blocks; ++b)
		if (fleck_at(uint32_t(b), by))
			flecks->push_back(2 * b);
}
#pragma GCC pop_options
#endif

/* Light flecks and scratches of a worn print, sparse enough to be drawn
 * after each row. A block row's flecks are found once for its two rows. */
struct Wear {
	const std::vector<Scratch> *scratches;
	kit::Path path;
	std::vector<int> flecks;
	uint32_t block_row = UINT32_MAX;

	void row(unsigned char *px, int width, int y)
	{
		for (const Scratch &scratch : *scratches) {
			if (kit::hash2(uint32_t(scratch.x), uint32_t(y) >> 5, 0x5c7a) & 3)
				brighten(px + size_t(scratch.x) * 4, scratch.strength);
		}
		if (uint32_t(y) >> 1 != block_row) {
			block_row = uint32_t(y) >> 1;
			flecks.clear();
#if KIT_X86
			if (path == kit::Path::AVX2) {
				fleck_blocks_avx2(width, block_row, &flecks);
			} else
#endif
				fleck_blocks_reference(width, block_row, &flecks);
		}
		for (int x : flecks) {
			brighten(px + size_t(x) * 4, 90);
			if (x + 1 < width)
				brighten(px + size_t(x + 1) * 4, 90);
		}
	}
};

/* The pixels x0..width-1 of row y, every step fused per pixel; the
 * features are template flags so that each look runs only the steps it
 * uses. This is the reference the vector path is held to. */
template <unsigned FEATURES>
void row_reference(const Kernel &kernel, const unsigned char *src, unsigned char *dst, int x0, int width, int y)
{
	const int32_t radial_y = (FEATURES & RADIAL) ? kernel.radial_row[y] : 0;
	const int32_t start = (FEATURES & (GRAIN | RADIAL)) ? kernel.strip_start[y] : 0;
	const int32_t *noise = (FEATURES & GRAIN) ? kernel.grain + start : nullptr;
	const int32_t *dither = (FEATURES & RADIAL) ? kernel.dither + start : nullptr;
	src += size_t(x0) * 4;
	dst += size_t(x0) * 4;
	for (int x = x0; x < width; ++x, src += 4, dst += 4) {
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
}

template <unsigned FEATURES>
void run_reference(const Kernel &k, const unsigned char *in, unsigned char *out, int width, int height)
{
	const Kernel kernel = k;
	Wear wear{kernel.scratches, kit::Path::REFERENCE, {}, UINT32_MAX};
	for (int y = 0; y < height; ++y) {
		size_t row = size_t(y) * size_t(width) * 4;
		row_reference<FEATURES>(kernel, in + row, out + row, 0, width, y);
		if (FEATURES & WORN)
			wear.row(out + row, width, y);
	}
}

#if KIT_X86
#pragma GCC push_options
#pragma GCC target("avx2")
/* Eight pixels a step: the same integer steps in 32-bit lanes, and the
 * three curve lookups as gathers from the curve table (which stays in the
 * first two cache levels). */
inline __m256i load(const int32_t *p)
{
	return _mm256_loadu_si256(reinterpret_cast<const __m256i *>(p));
}

template <unsigned FEATURES>
void run_avx2(const Kernel &k, const unsigned char *in, unsigned char *out,
					      int width, int height)
{
	const Kernel kernel = k;
	const __m256i low_byte = _mm256_set1_epi32(0xff);
	const __m256i opaque = _mm256_set1_epi32(int(0xff000000u));
	const __m256i luma_r = _mm256_set1_epi32(77), luma_g = _mm256_set1_epi32(150), luma_b = _mm256_set1_epi32(29);
	const __m256i saturation = _mm256_set1_epi32(kernel.saturation);
	const __m256i cap = _mm256_set1_epi32(kit::RADIAL_CAP);
	const __m256i level_span = _mm256_set1_epi32(3 * CURVE_SPAN);
	const __m256i pad = _mm256_set1_epi32(CURVE_PAD);
	const __m256i green_curve = _mm256_set1_epi32(CURVE_SPAN), blue_curve = _mm256_set1_epi32(2 * CURVE_SPAN);
	const int *table = reinterpret_cast<const int *>(&kernel.curves->map[0][0][0]);
	Wear wear{kernel.scratches, kit::Path::AVX2, {}, UINT32_MAX};
	/* A row's radial levels before dithering depend only on the row's part
	 * of the distance, which neighbouring rows often share: looked up once
	 * for each run of rows that shares it. */
	std::vector<int32_t> level_row((FEATURES & RADIAL) ? size_t(width) + 8 : 0);
	int32_t levels_for = -1;
	for (int y = 0; y < height; ++y) {
		size_t row = size_t(y) * size_t(width) * 4;
		const unsigned char *src = in + row;
		unsigned char *dst = out + row;
		if ((FEATURES & RADIAL) && kernel.radial_row[y] != levels_for) {
			levels_for = kernel.radial_row[y];
			const __m256i radial_y = _mm256_set1_epi32(levels_for);
			int x = 0;
			for (; x + 8 <= width; x += 8) {
				const __m256i d = _mm256_min_epi32(cap, _mm256_add_epi32(radial_y, load(kernel.radial_column + x)));
				_mm256_storeu_si256(reinterpret_cast<__m256i *>(&level_row[size_t(x)]),
						    _mm256_i32gather_epi32(kernel.level_of, d, 4));
			}
			for (; x < width; ++x)
				level_row[size_t(x)] = kernel.level_of[std::min(kit::RADIAL_CAP, levels_for + kernel.radial_column[x])];
		}
		const int32_t start = (FEATURES & (GRAIN | RADIAL)) ? kernel.strip_start[y] : 0;
		const int32_t *noise = (FEATURES & GRAIN) ? kernel.grain + start : nullptr;
		const int32_t *dither = (FEATURES & RADIAL) ? kernel.dither + start : nullptr;
		int x = 0;
		for (; x + 8 <= width; x += 8) {
			const __m256i px = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(src + size_t(x) * 4));
			__m256i b = _mm256_and_si256(px, low_byte);
			__m256i g = _mm256_and_si256(_mm256_srli_epi32(px, 8), low_byte);
			__m256i r = _mm256_and_si256(_mm256_srli_epi32(px, 16), low_byte);
			if (FEATURES & (MONO | SATURATION)) {
				const __m256i l = _mm256_srli_epi32(
					_mm256_add_epi32(_mm256_add_epi32(_mm256_mullo_epi32(r, luma_r), _mm256_mullo_epi32(g, luma_g)),
							 _mm256_mullo_epi32(b, luma_b)),
					8);
				if (FEATURES & MONO) {
					r = g = b = l;
				} else {
					auto saturate = [&](__m256i c) {
						return _mm256_add_epi32(
							l, _mm256_srai_epi32(_mm256_mullo_epi32(_mm256_sub_epi32(c, l), saturation), 8));
					};
					r = saturate(r);
					g = saturate(g);
					b = saturate(b);
				}
			}
			__m256i base = (FEATURES & GRAIN) ? _mm256_add_epi32(load(noise + x), pad) : pad;
			if (FEATURES & RADIAL) {
				const __m256i level = _mm256_srli_epi32(_mm256_add_epi32(load(&level_row[size_t(x)]), load(dither + x)), 4);
				base = _mm256_add_epi32(base, _mm256_mullo_epi32(level, level_span));
			}
			auto lookup = [&](__m256i index) {
				return _mm256_and_si256(_mm256_i32gather_epi32(table, index, 1), low_byte);
			};
			const __m256i out_b = lookup(_mm256_add_epi32(_mm256_add_epi32(base, blue_curve), b));
			const __m256i out_g = lookup(_mm256_add_epi32(_mm256_add_epi32(base, green_curve), g));
			const __m256i out_r = lookup(_mm256_add_epi32(base, r));
			const __m256i pixel = _mm256_or_si256(_mm256_or_si256(out_b, _mm256_slli_epi32(out_g, 8)),
							      _mm256_or_si256(_mm256_slli_epi32(out_r, 16), opaque));
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + size_t(x) * 4), pixel);
		}
		row_reference<FEATURES>(kernel, src, dst, x, width, y);
		if (FEATURES & WORN)
			wear.row(dst, width, y);
	}
}
#pragma GCC pop_options
#endif

using Runner = void (*)(const Kernel &, const unsigned char *, unsigned char *, int, int);

template <unsigned... F>
constexpr auto make_runners(std::integer_sequence<unsigned, F...>)
{
#if KIT_X86
	return std::array<std::array<Runner, 2>, sizeof...(F)>{{{&run_reference<F>, &run_avx2<F>}...}};
#else
	return std::array<std::array<Runner, 2>, sizeof...(F)>{{{&run_reference<F>, &run_reference<F>}...}};
#endif
}

/* By feature set, then by path. */
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
	/* Each curve over the padded span, carried on at slope 1 past its
	 * ends: worked out once, so that the level loop below reads in order
	 * and runs a vector at a time. */
	float extended[3][CURVE_SPAN];
	for (int c = 0; c < 3; ++c)
		for (int i = 0; i < CURVE_SPAN; ++i) {
			int v = i - CURVE_PAD;
			extended[c][i] = base[c].map[std::clamp(v, 0, 255)] + float(v - std::clamp(v, 0, 255));
		}
	for (int level = 0; level < LEVELS; ++level) {
		float w = look.strength * float(level) / float(LEVELS - 1);
		for (int c = 0; c < 3; ++c) {
			const float *from = extended[c];
			float shaded[CURVE_SPAN];
			if (look.radial == RADIAL_SHADE)
				for (int i = 0; i < CURVE_SPAN; ++i)
					shaded[i] = from[i] + (colour[c] - from[i]) * w;
			else if (look.radial == RADIAL_GLOW)
				for (int i = 0; i < CURVE_SPAN; ++i)
					shaded[i] = from[i] + (255.f - from[i]) * colour[c] / 255.f * w;
			else
				std::copy(from, from + CURVE_SPAN, shaded);
			uint8_t *to = curves->map[level][c];
			/* kit::clamp_byte, in a form that runs a vector at a time. */
			for (int i = 0; i < CURVE_SPAN; ++i) {
				const float t = shaded[i] > 0.f ? shaded[i] : 0.f;
				to[i] = uint8_t(int((t < 255.f ? t : 255.f) + 0.5f));
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
		std::vector<int32_t> level_of;
		if (look.radial != RADIAL_NONE) {
			radial.emplace(width, height, look.cx, look.cy);
			level_of.resize(kit::RADIAL_CAP + 1);
			for (int d = 0; d <= kit::RADIAL_CAP; ++d) {
				float distance = std::sqrt(float(d) / 256.f);
				level_of[size_t(d)] = int32_t(radial_weight(look, distance) * float((LEVELS - 1) * LEVEL_FRACTION));
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
		RUNNERS[features][kit::best_path() == kit::Path::AVX2](kernel, in, out, width, height);
		return int(kit::RESULT_OK);
	});
}

} // namespace pee
