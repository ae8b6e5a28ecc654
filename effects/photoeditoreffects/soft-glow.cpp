#include "look.h"
#include "photoeditoreffects.h"

namespace {

/* The picture's highlights (colour weighted by how far the pixel's luma is
 * into the light tones), averaged over factor x factor blocks: the glow
 * source, shrunk in the same pass that picks it out. */
void shrunk_highlights(const unsigned char *in, int width, int height, int factor, kit::Plane *small[3])
{
	const int sw = small[0]->width, sh = small[0]->height;
	std::vector<float> row[3];
	for (auto &r : row)
		r.resize(size_t(sw));
	kit::Floats weighted[3];
	for (auto &w : weighted)
		w.resize(size_t(width));
	for (int sy = 0; sy < sh; ++sy) {
		for (auto &r : row)
			std::fill(r.begin(), r.end(), 0.f);
		const int y0 = sy * factor, y1 = std::min(y0 + factor, height);
		for (int y = y0; y < y1; ++y) {
			const unsigned char *px = in + size_t(y) * size_t(width) * 4;
			for (int x = 0; x < width; ++x, px += 4) {
				float b = px[0], g = px[1], r = px[2];
				float keep = kit::smoothstep(110.f, 240.f, 0.299f * r + 0.587f * g + 0.114f * b);
				weighted[0][size_t(x)] = r * keep;
				weighted[1][size_t(x)] = g * keep;
				weighted[2][size_t(x)] = b * keep;
			}
			/* Added block by block in the order of the pixels. */
			for (int c = 0; c < 3; ++c)
				for (int sx = 0, x = 0; sx < sw; ++sx)
					for (const int end = std::min(x + factor, width); x < end; ++x)
						row[c][size_t(sx)] += weighted[c][size_t(x)];
		}
		for (int sx = 0; sx < sw; ++sx) {
			const float count = float(std::min(factor, width - sx * factor) * (y1 - y0));
			for (int c = 0; c < 3; ++c)
				small[c]->v[size_t(sy) * size_t(sw) + size_t(sx)] = row[c][size_t(sx)] / count;
		}
	}
}

} // namespace

namespace {

inline int soft_glow_body(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return kit::guarded([&] {
		const float strength = float(level) / 100.f;
		const float extent = float(std::max(width, height));

		/* The glow is wide: worked out on a grid a few times coarser. */
		const float glow_sigma = extent / 70.f;
		const int factor = std::clamp(int(glow_sigma / 1.6f), 1, std::min(width, height));
		kit::Rgb small((width + factor - 1) / factor, (height + factor - 1) / factor);
		kit::Plane *small_planes[3] = {&small.r, &small.g, &small.b};
		shrunk_highlights(in, width, height, factor, small_planes);

		const float soften = 0.6f * strength;
		const float bloom_gain = 1.1f * strength;
		const float bloom_cap = 255.f * strength;
		constexpr float INVERSE_255 = 1.f / 255.f;
		/* The three channels side by side, so that each output row is
		 * written whole; red, green and blue are bytes 2, 1 and 0. */
		std::unique_ptr<kit::Expander> glow_rows[3];
		std::unique_ptr<kit::BlurredRows> soft_rows[3];
		for (int c = 0; c < 3; ++c) {
			kit::gaussian_blur_full(*small_planes[c], glow_sigma / float(factor));
			glow_rows[c] = std::make_unique<kit::Expander>(*small_planes[c], factor, width, height);
			soft_rows[c] = std::make_unique<kit::BlurredRows>(width, height, std::max(1.f, extent / 400.f),
									  kit::ChannelRows(in, width, 4, 2 - c));
		}
		const kit::Path path = kit::best_path();
		kit::Floats rows(size_t(width) * 5);
		float *soft = rows.data(), *glow = soft + width, *lit[3] = {glow + width, glow + 2 * width, glow + 3 * width};
		for (int y = 0; y < height; ++y) {
			const unsigned char *px = in + size_t(y) * size_t(width) * 4;
			for (int c = 0; c < 3; ++c) {
				soft_rows[c]->row(y, soft);
				glow_rows[c]->row(y, glow);
				const unsigned char *src = px + (2 - c);
				float *dst = lit[c];
				for (int x = 0; x < width; ++x) {
					float o = src[size_t(x) * 4];
					float base = o + (soft[x] - o) * soften;
					float bloom = std::min(bloom_cap, glow[x] * bloom_gain);
					dst[x] = 255.f - (255.f - base) * (255.f - bloom) * INVERSE_255;
				}
			}
			kit::write_row(lit[2], lit[1], lit[0], out + size_t(y) * size_t(width) * 4, width, 4, path);
		}
		return int(kit::RESULT_OK);
	});
}

int soft_glow_reference(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return soft_glow_body(in, out, width, height, level);
}

#if KIT_X86
__attribute__((target("avx2"), flatten)) int soft_glow_avx2(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	return soft_glow_body(in, out, width, height, level);
}
#endif

} // namespace

/* Soft glow: a diffusion filter. The picture is softened and its
 * highlights, blurred wide, are screened back over it so that light areas
 * bloom. `level` 0..100 is the strength (100, what the editor passes, is
 * the full effect; 0 keeps the picture); other levels are refused. The blur
 * widths follow the picture's size, so a thumbnail looks like the full
 * picture. */
int applySoftglow(const unsigned char *in, unsigned char *out, int width, int height, int level)
{
	if (!pee::bgra_arguments_usable(in, out, width, height) || level < 0 || level > 100)
		return kit::RESULT_BAD_ARGUMENT;
#if KIT_X86
	if (kit::best_path() == kit::Path::AVX2)
		return soft_glow_avx2(in, out, width, height, level);
#endif
	return soft_glow_reference(in, out, width, height, level);
}
