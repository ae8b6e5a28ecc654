/* The pixels of a progressive JPEG from the coefficients that
 * ie-image-progressive.cpp read: each block turned into S x S samples at
 * S/8 of the size by an inverse DCT of its lowest S x S coefficients (chroma
 * at its own scale, so that it needs no upsampling), then YCbCr to BGRA. */
#include "ie-image-progressive.h"

#include <emmintrin.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <new>
#include <vector>

namespace {

constexpr int MAX_COMPONENTS = 3;

/* Basis of an n-point inverse DCT of the lowest n coefficients, as a
 * reduced 8-point one: row x, coefficient u. */
struct Idct_Basis {
	float m[8][8];
	explicit Idct_Basis(int n)
	{
		for (int x = 0; x < n; x++)
			for (int u = 0; u < n; u++)
				m[x][u] = float((u ? 1.0 : std::sqrt(0.5)) * std::cos((2 * x + 1) * u * M_PI / (2 * n)) / 2);
	}
};

const Idct_Basis &basis(int n)
{
	static const Idct_Basis b1(1), b2(2), b4(4), b8(8);
	return n == 1 ? b1 : n == 2 ? b2 : n == 4 ? b4 : b8;
}

struct Zigzag_Index {
	uint8_t of[64];
	constexpr Zigzag_Index() : of()
	{
		for (int k = 0; k < 64; k++)
			of[IE_JPEG_NATURAL_ORDER[k]] = uint8_t(k);
	}
};
constexpr Zigzag_Index ZIGZAG_INDEX;

/* One block to NX x NY samples into `out` (rows `stride` apart), rounded
 * half up and clamped; sizes fixed so that the loops unroll. */
template <int NX, int NY>
void idct_block(const int16_t *coef, const uint16_t *quant, const Idct_Basis &bx, const Idct_Basis &by, uint8_t *out,
		size_t stride)
{
	float rows[NY][NX]; /* [v][x] */
	for (int v = 0; v < NY; v++) {
		float f[NX];
		for (int u = 0; u < NX; u++) {
			const int z = ZIGZAG_INDEX.of[v * 8 + u];
			f[u] = float(coef[z] * quant[z]);
		}
		for (int x = 0; x < NX; x++) {
			float sum = 0;
			for (int u = 0; u < NX; u++)
				sum += bx.m[x][u] * f[u];
			rows[v][x] = sum;
		}
	}
	for (int y = 0; y < NY; y++)
		for (int x = 0; x < NX; x++) {
			float sum = 128.0f;
			for (int v = 0; v < NY; v++)
				sum += by.m[y][v] * rows[v][x];
			/* floor(sum + 0.5), clamped: below zero it is 0 either way. */
			out[size_t(y) * stride + size_t(x)] = uint8_t(sum <= 0 ? 0 : sum >= 255 ? 255 : int(sum + 0.5f));
		}
}

/* Four or eight samples wide: whole rows in vectors (SSE2, which every
 * x86-64 has). */
template <int NX, int NY>
void idct_block_vector(const int16_t *coef, const uint16_t *quant, const Idct_Basis &bx, const Idct_Basis &by,
		       uint8_t *out, size_t stride)
{
	constexpr int LANES = NX / 4;
	/* Column u of the row basis, as vectors over x. */
	__m128 basis_column[NX][LANES];
	for (int u = 0; u < NX; u++)
		for (int l = 0; l < LANES; l++)
			basis_column[u][l] = _mm_setr_ps(bx.m[4 * l][u], bx.m[4 * l + 1][u], bx.m[4 * l + 2][u], bx.m[4 * l + 3][u]);
	__m128 rows[NY][LANES];
	for (int v = 0; v < NY; v++)
		for (int l = 0; l < LANES; l++) {
			__m128 sum = _mm_setzero_ps();
			for (int u = 0; u < NX; u++) {
				const int z = ZIGZAG_INDEX.of[v * 8 + u];
				sum = _mm_add_ps(sum, _mm_mul_ps(basis_column[u][l], _mm_set1_ps(float(coef[z] * quant[z]))));
			}
			rows[v][l] = sum;
		}
	const __m128 half = _mm_set1_ps(0.5f), zero = _mm_setzero_ps(), top = _mm_set1_ps(255.0f);
	for (int y = 0; y < NY; y++)
		for (int l = 0; l < LANES; l++) {
			__m128 sum = _mm_set1_ps(128.0f);
			for (int v = 0; v < NY; v++)
				sum = _mm_add_ps(sum, _mm_mul_ps(_mm_set1_ps(by.m[y][v]), rows[v][l]));
			/* floor(sum + 0.5), clamped, as the narrow blocks round. */
			const __m128i value = _mm_cvttps_epi32(_mm_min_ps(_mm_max_ps(_mm_add_ps(sum, half), zero), top));
			const __m128i words = _mm_packs_epi32(value, value);
			const int packed = _mm_cvtsi128_si32(_mm_packus_epi16(words, words));
			memcpy(out + size_t(y) * stride + size_t(4 * l), &packed, 4);
		}
}

using Idct_Row = void (*)(const int16_t *, const uint16_t *, const Idct_Basis &, const Idct_Basis &, uint8_t *, size_t);

/* One and two samples square, the luma at a quarter and an eighth of the
 * size: every basis value is +-1/(2 sqrt 2) (or 1/(2 sqrt 2) squared, an
 * eighth, for the DC), so the samples are sums and differences over 8 in
 * integers, rounded half up. */
inline uint8_t eighth_plus_128(int64_t v)
{
	const int64_t value = (v + 1028) >> 3;
	return uint8_t(value < 0 ? 0 : value > 255 ? 255 : value);
}

void idct_block_1x1(const int16_t *coef, const uint16_t *quant, const Idct_Basis &, const Idct_Basis &, uint8_t *out,
		    size_t)
{
	out[0] = eighth_plus_128(coef[0] * quant[0]);
}

void idct_block_2x2(const int16_t *coef, const uint16_t *quant, const Idct_Basis &, const Idct_Basis &, uint8_t *out,
		    size_t stride)
{
	/* Zigzag 0, 1, 2, 4: (0, 0), across (0, 1), down (1, 0), (1, 1). Each
	 * product fits an int, their sums only 64 bits. */
	const int64_t dc = coef[0] * quant[0], across = coef[1] * quant[1];
	const int64_t down = coef[2] * quant[2], both = coef[4] * quant[4];
	const int64_t top_sum = dc + down, bottom_sum = dc - down;
	const int64_t top_diff = across + both, bottom_diff = across - both;
	out[0] = eighth_plus_128(top_sum + top_diff);
	out[1] = eighth_plus_128(top_sum - top_diff);
	out[stride] = eighth_plus_128(bottom_sum + bottom_diff);
	out[stride + 1] = eighth_plus_128(bottom_sum - bottom_diff);
}

template <int NX, int NY> constexpr Idct_Row idct_of()
{
	if constexpr (NX == 1 && NY == 1)
		return idct_block_1x1;
	else if constexpr (NX == 2 && NY == 2)
		return idct_block_2x2;
	else if constexpr (NX >= 4)
		return idct_block_vector<NX, NY>;
	else
		return idct_block<NX, NY>;
}

template <int NX> Idct_Row idct_for_height(int ny)
{
	return ny == 1 ? idct_of<NX, 1>() : ny == 2 ? idct_of<NX, 2>() : ny == 4 ? idct_of<NX, 4>() : idct_of<NX, 8>();
}

Idct_Row idct_for(int nx, int ny)
{
	return nx == 1 ? idct_for_height<1>(ny) : nx == 2 ? idct_for_height<2>(ny) : nx == 4 ? idct_for_height<4>(ny)
											   : idct_for_height<8>(ny);
}

/* YCbCr to BGRA in 16-bit fixed point, the JFIF equations. */
struct Colour_Tables {
	int cr_r[256], cb_b[256], cr_g[256], cb_g[256];
	Colour_Tables()
	{
		constexpr double ONE = 1 << 16;
		for (int i = 0; i < 256; i++) {
			const int c = i - 128;
			cr_r[i] = (int(std::lround(1.40200 * ONE * c)) + (1 << 15)) >> 16;
			cb_b[i] = (int(std::lround(1.77200 * ONE * c)) + (1 << 15)) >> 16;
			cr_g[i] = -int(std::lround(0.71414 * ONE * c));
			cb_g[i] = -int(std::lround(0.34414 * ONE * c)) + (1 << 15);
		}
	}
};

inline uint8_t clamp_byte(int v)
{
	return uint8_t(v < 0 ? 0 : v > 255 ? 255 : v);
}

} // namespace

bool ie_progressive_scale_ok(const Ie_Progressive &p, int *w, int *h)
{
	const int scale = p.scale;
	*w = int((long(p.width) * scale + 7) / 8);
	*h = int((long(p.height) * scale + 7) / 8);
	for (int c = 0; c < p.components; c++)
		if (scale * p.hmax / p.planes[c].h > 8 || scale * p.vmax / p.planes[c].v > 8)
			return false;
	return scale == 1 || scale == 2 || scale == 4 || scale == 8;
}

Ie_Decode_Status ie_progressive_render(const Ie_Progressive &p, Ie_Progressive_Rows rows, void *data,
				       Ie_Decode_Stop stop, void *stop_data)
{
	int out_w, out_h;
	if (!ie_progressive_scale_ok(p, &out_w, &out_h))
		return Ie_Decode_Status::FAILED;
	const int scale = p.scale;
	/* Each component's samples of one MCU row, at the output's scale. */
	const size_t plane_w = size_t(p.mcus_x) * size_t(p.hmax) * size_t(scale);
	const int band_h = p.vmax * scale;
	std::vector<uint8_t> samples[MAX_COMPONENTS];
	std::vector<uint8_t> strip;
	try {
		for (int c = 0; c < p.components; c++)
			samples[c].resize(plane_w * size_t(band_h));
		strip.resize(size_t(out_w) * 4 * size_t(band_h));
	} catch (const std::bad_alloc &) {
		return Ie_Decode_Status::FAILED;
	}
	static const Colour_Tables colour;
	for (int my = 0; my < p.mcus_y; my++) {
		if (stop && stop(stop_data))
			return Ie_Decode_Status::CANCELLED;
		for (int c = 0; c < p.components; c++) {
			const Ie_Progressive_Plane &plane = p.planes[c];
			const int nx = scale * p.hmax / plane.h, ny = scale * p.vmax / plane.v;
			const Idct_Row idct = idct_for(nx, ny);
			const Idct_Basis &basis_x = basis(nx), &basis_y = basis(ny);
			for (int by = 0; by < plane.v; by++)
				for (int bx = 0; bx < plane.blocks_w; bx++)
					idct(ie_progressive_block(plane, bx, my * plane.v + by), plane.quant, basis_x, basis_y,
					     &samples[c][size_t(by * ny) * plane_w + size_t(bx * nx)], plane_w);
		}
		const int y0 = my * band_h, count = std::min(band_h, out_h - y0);
		for (int y = 0; y < count; y++) {
			uint8_t *to = &strip[size_t(y) * size_t(out_w) * 4];
			const uint8_t *luma = &samples[0][size_t(y) * plane_w];
			if (p.components == 1) {
				for (int x = 0; x < out_w; x++) {
					to[4 * x] = to[4 * x + 1] = to[4 * x + 2] = luma[x];
					to[4 * x + 3] = 0xFF;
				}
				continue;
			}
			const uint8_t *cb = &samples[1][size_t(y) * plane_w], *cr = &samples[2][size_t(y) * plane_w];
			for (int x = 0; x < out_w; x++) {
				const int l = luma[x];
				to[4 * x] = clamp_byte(l + colour.cb_b[cb[x]]);
				to[4 * x + 1] = clamp_byte(l + ((colour.cb_g[cb[x]] + colour.cr_g[cr[x]]) >> 16));
				to[4 * x + 2] = clamp_byte(l + colour.cr_r[cr[x]]);
				to[4 * x + 3] = 0xFF;
			}
		}
		if (count > 0)
			rows(data, strip.data(), count);
	}
	return Ie_Decode_Status::DONE;
}
