/* Pictures and helpers for the effect tests: a photo-like BGRA picture, a
 * paper texture, every effect behind one BGRA-in, BGRA-out signature, and
 * measures of what an effect did (luma, edge energy, colour count). */
#ifndef EFFECTS_TEST_UTIL_H
#define EFFECTS_TEST_UTIL_H

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <functional>
#include <set>
#include <stdexcept>
#include <string>
#include <vector>

#include "PhotoEditorEngine.h"
#include "photoeditoreffects.h"

namespace effects_test {

using Bytes = std::vector<uint8_t>;

inline uint32_t mix(uint32_t x, uint32_t y)
{
	uint32_t h = x * 0x9e3779b1u ^ (y + 0x7f4a7c15u) * 0x85ebca77u;
	h ^= h >> 13;
	h *= 0xc2b2ae3du;
	return h ^ (h >> 16);
}

/* Sky gradient over grass, a dark house, a bright sun, fine noise: smooth
 * areas, hard edges and texture, like a photo. */
inline Bytes photo(int width, int height)
{
	Bytes px(size_t(width) * size_t(height) * 4);
	for (int y = 0; y < height; ++y) {
		for (int x = 0; x < width; ++x) {
			float fy = float(y) / float(height), fx = float(x) / float(width);
			int r, g, b;
			if (fy < 0.6f) {
				r = int(90 + 80 * fy);
				g = int(140 + 60 * fy);
				b = int(230 - 40 * fy);
			} else {
				r = int(70 + 40 * fx);
				g = 150;
				b = 50;
			}
			float dx = fx - 0.75f, dy = fy - 0.2f;
			if (dx * dx + dy * dy < 0.008f)
				r = g = b = 250;
			if (fx > 0.2f && fx < 0.4f && fy > 0.4f && fy < 0.8f) {
				r = 150;
				g = 30;
				b = 35;
			}
			int n = int(mix(uint32_t(x), uint32_t(y)) % 17) - 8;
			uint8_t *p = &px[(size_t(y) * size_t(width) + size_t(x)) * 4];
			p[0] = uint8_t(std::clamp(b + n, 0, 255));
			p[1] = uint8_t(std::clamp(g + n, 0, 255));
			p[2] = uint8_t(std::clamp(r + n, 0, 255));
			p[3] = 255;
		}
	}
	return px;
}

/* Paper (about 238) with diagonal pencil strokes (about 120), BGRA. */
inline Bytes paper(int width, int height)
{
	Bytes px(size_t(width) * size_t(height) * 4);
	for (int y = 0; y < height; ++y) {
		for (int x = 0; x < width; ++x) {
			uint8_t v = (x + y) % 6 == 0 ? 120 : uint8_t(234 + mix(uint32_t(x), uint32_t(y)) % 8);
			uint8_t *p = &px[(size_t(y) * size_t(width) + size_t(x)) * 4];
			p[0] = p[1] = p[2] = v;
			p[3] = 255;
		}
	}
	return px;
}

inline Bytes bgra_to_rgb(const Bytes &bgra)
{
	Bytes rgb(bgra.size() / 4 * 3);
	for (size_t i = 0; i < bgra.size() / 4; ++i) {
		rgb[i * 3] = bgra[i * 4 + 2];
		rgb[i * 3 + 1] = bgra[i * 4 + 1];
		rgb[i * 3 + 2] = bgra[i * 4];
	}
	return rgb;
}

/* An engine effect as a BGRA effect: the picture goes through RGB888
 * records, the sketch gets the paper texture, and unusable arguments reach
 * the engine as they are, for it to refuse. */
inline int apply_engine(int id, int32_t option, const uint8_t *in, uint8_t *out, int width, int height)
{
	bool usable = in && out && width > 0 && height > 0 && int64_t(width) * height <= (1 << 24);
	Bytes rgb_in = usable ? bgra_to_rgb(Bytes(in, in + size_t(width) * size_t(height) * 4)) : Bytes();
	Bytes rgb_out(rgb_in.size(), 0), texture = usable ? paper(width, height) : Bytes();
	IEL_Image input{uint32_t(width), uint32_t(height), IEL_FORMAT_RGB888, usable ? rgb_in.data() : const_cast<uint8_t *>(in)};
	IEL_Image output{uint32_t(width), uint32_t(height), IEL_FORMAT_RGB888, usable ? rgb_out.data() : out};
	IEL_Image paper_record{uint32_t(width), uint32_t(height), IEL_FORMAT_BGRA8888, texture.data()};
	IEL_EffectParam param{};
	param.u16EffectId = uint16_t(id);
	param.ps32Option = &option;
	param.pstTexture = id == IEL_EFFECT_ID_SKETCH ? &paper_record : nullptr;
	int result = IEL_Apply_Effect(&input, &output, &param);
	for (size_t i = 0; result == 0 && i < rgb_out.size() / 3; ++i) {
		out[i * 4] = rgb_out[i * 3 + 2], out[i * 4 + 1] = rgb_out[i * 3 + 1];
		out[i * 4 + 2] = rgb_out[i * 3], out[i * 4 + 3] = 255;
	}
	return result;
}

using Effect = std::function<int(const uint8_t *, uint8_t *, int, int)>;

struct NamedEffect {
	std::string name;
	Effect run;
	/* Colour and tone effects work pixel by pixel. */
	bool tone;
};

inline void PrintTo(const NamedEffect &e, std::ostream *os)
{
	*os << e.name;
}

/* Every effect at the level or option the editor uses. */
inline const std::vector<NamedEffect> &all_effects()
{
	static const std::vector<NamedEffect> effects = {
		{"Vintage", applyVintage, true},
		{"OldPhoto", applyOldPhoto, true},
		{"PopArt", applyPopArt, true},
		{"Negative", applyInvert, true},
		{"Retro", applyRetro, true},
		{"Bluewash", applyBluewash, true},
		{"Sunshine", applySunshine, true},
		{"Nostalgia", applyNostalgia, true},
		{"Downlight", applyDownlight, true},
		{"YellowGlow", applyYellowglow, true},
		{"Greyscale", [](const uint8_t *i, uint8_t *o, int w, int h) { return controlGreyscale(i, o, w, h, 10); }, true},
		{"FadedColours", [](const uint8_t *i, uint8_t *o, int w, int h) { return controlFadedColour(i, o, w, h, 50); }, true},
		{"SoftGlow", [](const uint8_t *i, uint8_t *o, int w, int h) { return applySoftglow(i, o, w, h, 100); }, false},
		{"Sharpen", [](const uint8_t *i, uint8_t *o, int w, int h) { return mi_apply_sharpen_all(i, o, w, h, 4); }, false},
		{"MagicPen", [](const uint8_t *i, uint8_t *o, int w, int h) { return apply_engine(IEL_EFFECT_ID_MAGIC_PEN, 2, i, o, w, h); }, false},
		{"Sketch", [](const uint8_t *i, uint8_t *o, int w, int h) { return apply_engine(IEL_EFFECT_ID_SKETCH, 2, i, o, w, h); }, false},
		{"Cartoon", [](const uint8_t *i, uint8_t *o, int w, int h) { return apply_engine(IEL_EFFECT_ID_CARTOON, 2, i, o, w, h); }, false},
		{"OilPaint", [](const uint8_t *i, uint8_t *o, int w, int h) { return apply_engine(IEL_EFFECT_ID_OIL_PAINT, 2, i, o, w, h); }, false},
	};
	return effects;
}

inline const NamedEffect &effect(const std::string &name)
{
	for (const NamedEffect &e : all_effects())
		if (e.name == name)
			return e;
	throw std::invalid_argument(name);
}

/* Runs an effect into a zero-filled buffer, as the editor does. */
inline Bytes run(const NamedEffect &e, const Bytes &in, int width, int height)
{
	Bytes out(in.size(), 0);
	EXPECT_EQ(e.run(in.data(), out.data(), width, height), 0) << e.name;
	return out;
}

inline float luma_at(const Bytes &px, size_t i)
{
	return 0.299f * px[i * 4 + 2] + 0.587f * px[i * 4 + 1] + 0.114f * px[i * 4];
}

inline double mean_luma(const Bytes &px)
{
	double sum = 0;
	for (size_t i = 0; i < px.size() / 4; ++i)
		sum += luma_at(px, i);
	return sum / double(px.size() / 4);
}

/* Sum of absolute luma differences between neighbours. */
inline double edge_energy(const Bytes &px, int width, int height)
{
	double sum = 0;
	for (int y = 0; y + 1 < height; ++y) {
		for (int x = 0; x + 1 < width; ++x) {
			size_t i = size_t(y) * size_t(width) + size_t(x);
			sum += std::fabs(luma_at(px, i + 1) - luma_at(px, i)) +
			       std::fabs(luma_at(px, i + size_t(width)) - luma_at(px, i));
		}
	}
	return sum;
}

inline size_t distinct_colours(const Bytes &px)
{
	std::set<uint32_t> colours;
	for (size_t i = 0; i < px.size(); i += 4)
		colours.insert(uint32_t(px[i]) | uint32_t(px[i + 1]) << 8 | uint32_t(px[i + 2]) << 16);
	return colours.size();
}

/* Mean absolute difference per colour byte. */
inline double mean_difference(const Bytes &a, const Bytes &b)
{
	double sum = 0;
	size_t n = 0;
	for (size_t i = 0; i < a.size(); i += 4, n += 3)
		for (size_t c = 0; c < 3; ++c)
			sum += std::abs(int(a[i + c]) - int(b[i + c]));
	return sum / double(n);
}

} // namespace effects_test

#endif
