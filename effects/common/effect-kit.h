/* Building blocks shared by both effect libraries: argument checks, tone
 * curves, position hashes, radial distances, planes, blurs and edge
 * detection. Everything is per call: no state outlives a function. */
#ifndef EFFECT_KIT_H
#define EFFECT_KIT_H

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <new>
#include <vector>

#if defined(__x86_64__) || defined(__i386__)
#define KIT_X86 1
#include <immintrin.h>
#else
#define KIT_X86 0
#endif

namespace kit {

/* Every pixel routine has a plain reference and, on processors with AVX2, a
 * vector path that gives the same bytes; the tests hold one to the other. */
enum class Path { REFERENCE, AVX2 };

/* A path the tests pin so that both run in one process; nothing else
 * sets it. */
struct PathPin {
	bool pinned = false;
	Path path = Path::REFERENCE;
};

inline PathPin &path_pin()
{
	static PathPin pin;
	return pin;
}

/* AVX2 where the processor has it, unless IEL_NO_SIMD=1 (the engine's
 * switch: one variable turns every vector path off). */
inline Path best_path()
{
	if (path_pin().pinned)
		return path_pin().path;
#if KIT_X86
	static const Path path = [] {
		const char *off = std::getenv("IEL_NO_SIMD");
		if (off && std::strcmp(off, "1") == 0)
			return Path::REFERENCE;
		__builtin_cpu_init();
		return __builtin_cpu_supports("avx2") ? Path::AVX2 : Path::REFERENCE;
	}();
	return path;
#else
	return Path::REFERENCE;
#endif
}

enum Result {
	RESULT_OK = 0,
	RESULT_BAD_ARGUMENT = 1,
	RESULT_NO_MEMORY = 2
};

/* Largest picture accepted (2^27 pixels): every buffer of the picture's
 * size, floats included, stays addressable on the 32-bit target. */
constexpr int64_t MAX_PIXELS = int64_t(1) << 27;

inline bool size_usable(int64_t width, int64_t height)
{
	return width > 0 && height > 0 && width * height <= MAX_PIXELS;
}

inline uint8_t clamp_byte(int v)
{
	return uint8_t(v < 0 ? 0 : (v > 255 ? 255 : v));
}

inline uint8_t clamp_byte(float v)
{
	return uint8_t(v <= 0.f ? 0 : (v >= 255.f ? 255 : int(v + 0.5f)));
}

#if KIT_X86
/* clamp_byte of eight values, each in a 32-bit lane. */
__attribute__((target("avx2"))) inline __m256i clamp_bytes_avx2(__m256 v)
{
	const __m256i rounded = _mm256_cvttps_epi32(_mm256_add_ps(v, _mm256_set1_ps(0.5f)));
	const __m256i low = _mm256_castps_si256(_mm256_cmp_ps(v, _mm256_setzero_ps(), _CMP_LE_OQ));
	const __m256i high = _mm256_castps_si256(_mm256_cmp_ps(v, _mm256_set1_ps(255.f), _CMP_GE_OQ));
	return _mm256_blendv_epi8(_mm256_andnot_si256(low, rounded), _mm256_set1_epi32(255), high);
}

/* Eight pixels of three 0..255 lanes as 24 bytes, the first lane first. */
__attribute__((target("avx2"))) inline void store_three_avx2(__m256i first, __m256i second, __m256i third, uint8_t *dst)
{
	const __m256i pixels = _mm256_or_si256(first, _mm256_or_si256(_mm256_slli_epi32(second, 8), _mm256_slli_epi32(third, 16)));
	const __m256i order = _mm256_setr_epi8(0, 1, 2, 4, 5, 6, 8, 9, 10, 12, 13, 14, -1, -1, -1, -1, 0, 1, 2, 4, 5, 6, 8,
					       9, 10, 12, 13, 14, -1, -1, -1, -1);
	const __m256i packed =
		_mm256_permutevar8x32_epi32(_mm256_shuffle_epi8(pixels, order), _mm256_setr_epi32(0, 1, 2, 4, 5, 6, 3, 7));
	_mm_storeu_si128(reinterpret_cast<__m128i *>(dst), _mm256_castsi256_si128(packed));
	_mm_storel_epi64(reinterpret_cast<__m128i *>(dst + 16), _mm256_extracti128_si256(packed, 1));
}
#endif

/* A row of three float channels written as packed bytes, clamped and
 * rounded, the first channel first; `step` is the bytes per pixel (3, or 4
 * with the fourth byte set opaque). */
inline void write_row_reference(const float *first, const float *second, const float *third, uint8_t *dst, int width,
				int step)
{
	for (int x = 0; x < width; ++x, dst += step) {
		dst[0] = clamp_byte(first[x]);
		dst[1] = clamp_byte(second[x]);
		dst[2] = clamp_byte(third[x]);
		if (step == 4)
			dst[3] = 255;
	}
}

#if KIT_X86
__attribute__((target("avx2"))) inline void write_row_avx2(const float *first, const float *second, const float *third,
							    uint8_t *dst, int width, int step)
{
	int x = 0;
	if (step == 3) {
		for (; x + 8 <= width; x += 8)
			store_three_avx2(clamp_bytes_avx2(_mm256_loadu_ps(first + x)), clamp_bytes_avx2(_mm256_loadu_ps(second + x)),
					 clamp_bytes_avx2(_mm256_loadu_ps(third + x)), dst + size_t(x) * 3);
	} else {
		const __m256i opaque = _mm256_set1_epi32(int(0xff000000u));
		for (; x + 8 <= width; x += 8) {
			const __m256i pixels = _mm256_or_si256(
				_mm256_or_si256(clamp_bytes_avx2(_mm256_loadu_ps(first + x)),
						_mm256_slli_epi32(clamp_bytes_avx2(_mm256_loadu_ps(second + x)), 8)),
				_mm256_or_si256(_mm256_slli_epi32(clamp_bytes_avx2(_mm256_loadu_ps(third + x)), 16), opaque));
			_mm256_storeu_si256(reinterpret_cast<__m256i *>(dst + size_t(x) * 4), pixels);
		}
	}
	write_row_reference(first + x, second + x, third + x, dst + size_t(x) * size_t(step), width - x, step);
}
#endif

inline void write_row(const float *first, const float *second, const float *third, uint8_t *dst, int width, int step,
		      Path path)
{
#if KIT_X86
	if (path == Path::AVX2) {
		write_row_avx2(first, second, third, dst, width, step);
		return;
	}
#endif
	(void)path;
	write_row_reference(first, second, third, dst, width, step);
}

/* BT.601 luma in 8 bits; the weights add up to 256. */
inline int luma(int r, int g, int b)
{
	return (77 * r + 150 * g + 29 * b) >> 8;
}

inline float smoothstep(float edge0, float edge1, float x)
{
	float t = std::clamp((x - edge0) / (edge1 - edge0), 0.f, 1.f);
	return t * t * (3.f - 2.f * t);
}

/* A well-mixed 32-bit hash of a pixel position and a salt: grain, paper and
 * flecks are functions of where a pixel is, so the same picture always
 * gives the same bytes. */
inline uint32_t hash2(uint32_t x, uint32_t y, uint32_t salt = 0)
{
	uint32_t h = x * 0x8da6b343u ^ y * 0xd8163841u ^ salt * 0xcb1ab31fu;
	h ^= h >> 15;
	h *= 0x2c1b3c6du;
	h ^= h >> 12;
	h *= 0x297a2d39u;
	h ^= h >> 15;
	return h;
}

/* A 256-entry tone curve. */
struct Curve {
	uint8_t map[256];
};

/* Levels and shape in one curve: the input is raised to `gamma`, bent into
 * an S by `contrast` (0 = straight, 1 = strong), then spread between the
 * output black `lift` and the output white `gain`. */
struct CurveShape {
	float lift = 0.f;
	float gain = 255.f;
	float gamma = 1.f;
	float contrast = 0.f;
};

inline Curve make_curve(const CurveShape &shape)
{
	Curve curve;
	for (int i = 0; i < 256; ++i) {
		float x = std::pow(i / 255.f, shape.gamma);
		float s = x * x * (3.f - 2.f * x);
		x += (s - x) * shape.contrast;
		curve.map[i] = clamp_byte(shape.lift + (shape.gain - shape.lift) * x);
	}
	return curve;
}

/* Squared distance from a centre (cx, cy in -1..1 of the picture) over an
 * ellipse fitted to the picture, in 1/256ths of the squared distance from
 * the middle to a corner, capped at RADIAL_CAP. Split into a row part and a
 * column part so that the inner loop only adds. */
constexpr int RADIAL_CAP = 1023;

struct Radial {
	std::vector<int32_t> column;
	std::vector<int32_t> row;

	Radial(int width, int height, float cx, float cy) : column(size_t(width)), row(size_t(height))
	{
		/* The squared distance from the middle to a corner is 2. */
		auto part = [](int i, int n, float centre) {
			float d = (float(i) + 0.5f) / float(n) * 2.f - 1.f - centre;
			return int32_t(std::min(d * d * 128.f, float(RADIAL_CAP)));
		};
		for (int x = 0; x < width; ++x)
			column[size_t(x)] = part(x, width, cx);
		for (int y = 0; y < height; ++y)
			row[size_t(y)] = part(y, height, cy);
	}
};

/* Leaves new elements uninitialised: a plane is written before it is read,
 * and zero-filling megabytes first costs as much as the pass that fills
 * them. */
template <class T>
struct UninitialisedAllocator : std::allocator<T> {
	template <class U>
	struct rebind {
		using other = UninitialisedAllocator<U>;
	};
	UninitialisedAllocator() = default;
	template <class U>
	UninitialisedAllocator(const UninitialisedAllocator<U> &) noexcept {}
	template <class U>
	void construct(U *p) noexcept { ::new (static_cast<void *>(p)) U; }
	template <class U, class... A>
	void construct(U *p, A &&...a) { ::new (static_cast<void *>(p)) U(std::forward<A>(a)...); }
};

using Floats = std::vector<float, UninitialisedAllocator<float>>;

/* One channel of a picture as floats, rows back to back. */
struct Plane {
	int width = 0;
	int height = 0;
	Floats v;

	Plane() = default;
	Plane(int w, int h) : width(w), height(h), v(size_t(w) * size_t(h)) {}
	Plane(int w, int h, float fill) : width(w), height(h), v(size_t(w) * size_t(h), fill) {}
	float *row(int y) { return v.data() + size_t(y) * size_t(width); }
	const float *row(int y) const { return v.data() + size_t(y) * size_t(width); }
};

/* A picture as three float planes (red, green, blue). */
struct Rgb {
	Plane r, g, b;

	Rgb(int w, int h) : r(w, h), g(w, h), b(w, h) {}
	int width() const { return r.width; }
	int height() const { return r.height; }
};

/* Reads packed pixels whose red, green and blue are at the given byte
 * offsets; `step` is the bytes per pixel. */
inline Rgb read_rgb(const uint8_t *px, int width, int height, int step, int ri, int gi, int bi)
{
	Rgb rgb(width, height);
	size_t n = size_t(width) * size_t(height);
	for (size_t i = 0; i < n; ++i, px += step) {
		rgb.r.v[i] = px[ri];
		rgb.g.v[i] = px[gi];
		rgb.b.v[i] = px[bi];
	}
	return rgb;
}

inline Plane luma_plane(const Rgb &rgb)
{
	Plane y(rgb.width(), rgb.height());
	for (size_t i = 0; i < y.v.size(); ++i)
		y.v[i] = 0.299f * rgb.r.v[i] + 0.587f * rgb.g.v[i] + 0.114f * rgb.b.v[i];
	return y;
}

#if KIT_X86
/* Eight pixels a step, each read as the four bytes from its first; it stops
 * while a pixel follows, so the byte past the eighth is still the row's. */
__attribute__((target("avx2"))) inline int luma_row_avx2(const uint8_t *px, int width, float *dst)
{
	const __m256i offsets = _mm256_setr_epi32(0, 3, 6, 9, 12, 15, 18, 21), byte = _mm256_set1_epi32(0xFF);
	int x = 0;
	for (; x + 8 < width; x += 8) {
		const __m256i v = _mm256_i32gather_epi32(reinterpret_cast<const int *>(px + 3 * x), offsets, 1);
		const __m256 r = _mm256_cvtepi32_ps(_mm256_and_si256(v, byte));
		const __m256 g = _mm256_cvtepi32_ps(_mm256_and_si256(_mm256_srli_epi32(v, 8), byte));
		const __m256 b = _mm256_cvtepi32_ps(_mm256_and_si256(_mm256_srli_epi32(v, 16), byte));
		const __m256 rg = _mm256_add_ps(_mm256_mul_ps(_mm256_set1_ps(0.299f), r), _mm256_mul_ps(_mm256_set1_ps(0.587f), g));
		_mm256_storeu_ps(dst + x, _mm256_add_ps(rg, _mm256_mul_ps(_mm256_set1_ps(0.114f), b)));
	}
	return x;
}
#endif

/* The luma of a row of RGB pixels, as luma_plane weighs it. */
inline void luma_row(const uint8_t *px, int width, float *dst, Path path)
{
	(void)path;
	int x = 0;
#if KIT_X86
	if (path == Path::AVX2)
		x = luma_row_avx2(px, width, dst);
#endif
	for (; x < width; ++x)
		dst[x] = 0.299f * px[3 * x] + 0.587f * px[3 * x + 1] + 0.114f * px[3 * x + 2];
}

/* Writes the planes back, clamped and rounded; a fourth byte, when the
 * layout has one, is set opaque. */
inline void write_rgb(const Rgb &rgb, uint8_t *px, int step, int ri, int gi, int bi)
{
	size_t n = rgb.r.v.size();
	for (size_t i = 0; i < n; ++i, px += step) {
		px[ri] = clamp_byte(rgb.r.v[i]);
		px[gi] = clamp_byte(rgb.g.v[i]);
		px[bi] = clamp_byte(rgb.b.v[i]);
		if (step == 4)
			px[3] = 255;
	}
}

/* One byte of packed pixels (`step` bytes each) as a row of floats at a
 * time: a source of rows for the blurs that needs no plane. */
struct ChannelRows {
	const uint8_t *px;
	int width, step, channel;
	Floats row;

	ChannelRows(const uint8_t *pixels, int w, int bytes_per_pixel, int c)
		: px(pixels), width(w), step(bytes_per_pixel), channel(c), row(size_t(w))
	{
	}
	const float *operator()(int y)
	{
		const uint8_t *src = px + size_t(y) * size_t(width) * size_t(step) + size_t(channel);
		for (int x = 0; x < width; ++x)
			row[size_t(x)] = float(src[size_t(x) * size_t(step)]);
		return row.data();
	}
};

/* Box mean of radius r over every row, the border repeated; a running sum
 * makes it O(1) per sample whatever the radius. */
inline void box_blur_rows(Plane &p, int radius)
{
	const int w = p.width;
	const float norm = 1.f / float(2 * radius + 1);
	std::vector<float> line(size_t(w + 2 * radius + 1));
	for (int y = 0; y < p.height; ++y) {
		float *row = p.v.data() + size_t(y) * size_t(w);
		for (int i = 0; i < radius; ++i) {
			line[size_t(i)] = row[0];
			line[size_t(w + radius + i)] = row[w - 1];
		}
		line[size_t(w + 2 * radius)] = row[w - 1];
		std::copy(row, row + w, line.begin() + radius);
		float sum = 0.f;
		for (int i = 0; i < 2 * radius + 1; ++i)
			sum += line[size_t(i)];
		for (int x = 0; x < w; ++x) {
			row[x] = sum * norm;
			sum += line[size_t(x + 2 * radius + 1)] - line[size_t(x)];
		}
	}
}

/* The same down the columns, a whole row at a time so that memory is read
 * in order; writes into `dst` (the same size). */
inline void box_blur_columns(const Plane &src, Plane &dst, int radius)
{
	const size_t w = size_t(src.width);
	const int h = src.height;
	const float norm = 1.f / float(2 * radius + 1);
	auto row = [&](int y) { return src.v.data() + size_t(std::clamp(y, 0, h - 1)) * w; };
	std::vector<float> sum(w, 0.f);
	for (int y = -radius; y <= radius; ++y) {
		const float *r = row(y);
		for (size_t x = 0; x < w; ++x)
			sum[x] += r[x];
	}
	for (int y = 0; y < h; ++y) {
		float *out = dst.v.data() + size_t(y) * w;
		const float *enter = row(y + radius + 1), *leave = row(y - radius);
		for (size_t x = 0; x < w; ++x) {
			out[x] = sum[x] * norm;
			sum[x] += enter[x] - leave[x];
		}
	}
}

/* dst[x] = 0 + rows[0][x] * taps[0] + rows[1][x] * taps[1] + ..., added in
 * that order: a separable convolution's pass, the rows being shifted views
 * of one row (across) or neighbouring rows (down). */
inline void weighted_sum_reference(const float *const *rows, const float *taps, int n, int width, float *dst)
{
	std::fill(dst, dst + width, 0.f);
	for (int k = 0; k < n; ++k) {
		const float *src = rows[k];
		const float weight = taps[k];
		for (int x = 0; x < width; ++x)
			dst[x] += src[x] * weight;
	}
}

#if KIT_X86
/* The same sums kept in registers over all the taps, 32 outputs a step. */
__attribute__((target("avx2"))) inline void weighted_sum_avx2(const float *const *rows, const float *taps, int n,
							       int width, float *dst)
{
	int x = 0;
	for (; x + 32 <= width; x += 32) {
		__m256 a = _mm256_setzero_ps(), b = a, c = a, d = a;
		for (int k = 0; k < n; ++k) {
			const float *src = rows[k] + x;
			const __m256 weight = _mm256_broadcast_ss(taps + k);
			a = _mm256_add_ps(a, _mm256_mul_ps(_mm256_loadu_ps(src), weight));
			b = _mm256_add_ps(b, _mm256_mul_ps(_mm256_loadu_ps(src + 8), weight));
			c = _mm256_add_ps(c, _mm256_mul_ps(_mm256_loadu_ps(src + 16), weight));
			d = _mm256_add_ps(d, _mm256_mul_ps(_mm256_loadu_ps(src + 24), weight));
		}
		_mm256_storeu_ps(dst + x, a);
		_mm256_storeu_ps(dst + x + 8, b);
		_mm256_storeu_ps(dst + x + 16, c);
		_mm256_storeu_ps(dst + x + 24, d);
	}
	for (; x + 8 <= width; x += 8) {
		__m256 a = _mm256_setzero_ps();
		for (int k = 0; k < n; ++k)
			a = _mm256_add_ps(a, _mm256_mul_ps(_mm256_loadu_ps(rows[k] + x), _mm256_broadcast_ss(taps + k)));
		_mm256_storeu_ps(dst + x, a);
	}
	for (; x < width; ++x) {
		float sum = 0.f;
		for (int k = 0; k < n; ++k)
			sum += rows[k][x] * taps[k];
		dst[x] = sum;
	}
}
#endif

inline void weighted_sum(const float *const *rows, const float *taps, int n, int width, float *dst, Path path)
{
#if KIT_X86
	if (path == Path::AVX2) {
		weighted_sum_avx2(rows, taps, n, width, dst);
		return;
	}
#endif
	(void)path;
	weighted_sum_reference(rows, taps, n, width, dst);
}

/* The sampled Gaussian of a direct convolution: exact for the small widths
 * where box passes, whose radius is a whole number, cannot tell sigma 0.8
 * from sigma 1.2. */
inline std::vector<float> gaussian_taps(float sigma)
{
	const int radius = std::max(1, int(std::ceil(3.f * sigma)));
	std::vector<float> kernel(size_t(2 * radius + 1));
	float total = 0.f;
	for (int i = -radius; i <= radius; ++i)
		total += kernel[size_t(i + radius)] = std::exp(-float(i * i) / (2.f * sigma * sigma));
	for (float &k : kernel)
		k /= total;
	return kernel;
}

#if KIT_X86
/* Whole blocks of a row, eight a step, each summed from zero in the order
 * of its pixels and added to its running sum; returns the first block left
 * for the plain loop. */
__attribute__((target("avx2"))) inline int shrink_blocks_avx2(const float *src, int width, int factor, float *row_sum)
{
	const __m256i starts = _mm256_mullo_epi32(_mm256_setr_epi32(0, 1, 2, 3, 4, 5, 6, 7), _mm256_set1_epi32(factor));
	int sx = 0;
	for (; (sx + 8) * factor <= width; sx += 8) {
		const float *block = src + size_t(sx) * size_t(factor);
		__m256 sum = _mm256_setzero_ps();
		for (int i = 0; i < factor; ++i)
			sum = _mm256_add_ps(sum, _mm256_i32gather_ps(block + i, starts, 4));
		_mm256_storeu_ps(row_sum + sx, _mm256_add_ps(_mm256_loadu_ps(row_sum + sx), sum));
	}
	return sx;
}

/* The factor-2 case: eight pairs a step, each summed left to right and
 * added to its running sum; returns the first pair left for the plain
 * loop. */
__attribute__((target("avx2"))) inline int shrink_pairs_avx2(const float *src, int pairs, float *row_sum)
{
	int sx = 0;
	for (; sx + 8 <= pairs; sx += 8) {
		const __m256 low = _mm256_loadu_ps(src + 2 * sx), high = _mm256_loadu_ps(src + 2 * sx + 8);
		/* The pairs are summed within each half; the halves then put
		 * them in order. */
		const __m256 sums =
			_mm256_castpd_ps(_mm256_permute4x64_pd(_mm256_castps_pd(_mm256_hadd_ps(low, high)), 0xD8));
		_mm256_storeu_ps(row_sum + sx, _mm256_add_ps(_mm256_loadu_ps(row_sum + sx), sums));
	}
	return sx;
}
#endif

/* Row `sy` of the means of factor x factor blocks (the last ones partial)
 * of a width x height picture whose rows `rows(y)` hands out: rows
 * sy * factor on, in order. `row_sum` holds a shrunk row's width of
 * scratch. */
template <class Rows>
void shrink_row(int width, int height, int factor, int sy, Rows &&rows, float *row_sum, float *dst, Path path)
{
	(void)path;
	const int small_width = (width + factor - 1) / factor;
	std::fill(row_sum, row_sum + small_width, 0.f);
	const int y0 = sy * factor, y1 = std::min(y0 + factor, height);
	for (int y = y0; y < y1; ++y) {
		const float *src = rows(y);
		if (factor == 2) {
			/* The common case, without the inner loop's overhead. */
			const int pairs = width / 2;
			int sx = 0;
#if KIT_X86
			if (path == Path::AVX2)
				sx = shrink_pairs_avx2(src, pairs, row_sum);
#endif
			for (; sx < pairs; ++sx)
				row_sum[sx] += src[2 * sx] + src[2 * sx + 1];
			if (width % 2)
				row_sum[pairs] += src[width - 1];
			continue;
		}
		int sx = 0;
#if KIT_X86
		if (path == Path::AVX2)
			sx = shrink_blocks_avx2(src, width, factor, row_sum);
#endif
		for (; sx < small_width; ++sx) {
			const int x0 = sx * factor, x1 = std::min(x0 + factor, width);
			float sum = 0.f;
			for (int x = x0; x < x1; ++x)
				sum += src[x];
			row_sum[sx] += sum;
		}
	}
	for (int sx = 0; sx < small_width; ++sx) {
		const int columns = std::min(factor, width - sx * factor);
		dst[sx] = row_sum[sx] / float(columns * (y1 - y0));
	}
}

/* The whole shrunk picture. */
template <class Rows>
Plane shrink_rows(int width, int height, int factor, Rows &&rows)
{
	const Path path = best_path();
	Plane small((width + factor - 1) / factor, (height + factor - 1) / factor);
	Floats row_sum(size_t(small.width));
	for (int sy = 0; sy < small.height; ++sy)
		shrink_row(width, height, factor, sy, rows, row_sum.data(), small.row(sy), path);
	return small;
}

inline Plane shrink(const Plane &p, int factor)
{
	return shrink_rows(p.width, p.height, factor, [&](int y) { return p.row(y); });
}

/* Rows of a generator that makes them once each, in order (`make(y, row)`
 * fills row y), kept from the oldest row a reader may still ask for to the
 * newest made: readers ahead make rows as they ask, and the slowest one
 * lets the old rows go with keep_from. The store starts with room for
 * `rows` rows (all of them, where a reader must see the whole picture
 * before the first rows are used) and doubles when the readers are further
 * apart. A row's pointer holds until rows are next made. */
class RowWindow {
public:
	using Make = std::function<void(int, float *)>;

	RowWindow(int row_length, int rows, Make make)
		: length_(size_t(row_length)), capacity_(std::max(rows, 1)), make_(std::move(make)),
		  store_(size_t(capacity_) * length_)
	{
	}

	/* Row y, not below the last keep_from. */
	const float *row(int y)
	{
		while (made_ < y) {
			if (made_ + 1 - kept_from_ >= capacity_)
				grow();
			++made_;
			make_(made_, slot(made_));
		}
		return slot(y);
	}

	/* No row below y is asked for again. */
	void keep_from(int y) { kept_from_ = std::max(kept_from_, y); }

private:
	float *slot(int y) { return store_.data() + size_t(y % capacity_) * length_; }

	void grow()
	{
		const int capacity = 2 * capacity_;
		Floats store(size_t(capacity) * length_);
		for (int y = kept_from_; y <= made_; ++y)
			std::copy(slot(y), slot(y) + length_, store.data() + size_t(y % capacity) * length_);
		store_.swap(store);
		capacity_ = capacity;
	}

	size_t length_;
	int capacity_, made_ = -1, kept_from_ = 0;
	Make make_;
	Floats store_;
};

/* Bilinear enlargement of a shrunk plane, a row at a time: each output row
 * mixes two rows of the small plane interpolated across, which are worked
 * out once and kept while the output rows between them are made. Output
 * rows asked for in order ask for each small row once, in order, so a
 * generator may make those as they are needed. */
class Expander {
public:
	using SmallRows = std::function<const float *(int)>;

	Expander(const Plane &small, int factor, int width, int height)
		: Expander(small.width, small.height, [&small](int y) { return small.row(y); }, factor, width, height)
	{
	}

	Expander(int small_width, int small_height, SmallRows small_rows, int factor, int width, int height)
		: small_rows_(std::move(small_rows)), small_width_(small_width), small_height_(small_height), height_(height),
		  inverse_(1.f / float(factor)), x0_(size_t(width)), x1_(size_t(width)), fx_(size_t(width)),
		  across_{Floats(size_t(width)), Floats(size_t(width))}
	{
		for (int x = 0; x < width; ++x) {
			float sx = std::clamp((float(x) + 0.5f) * inverse_ - 0.5f, 0.f, float(small_width - 1));
			x0_[size_t(x)] = int(sx);
			x1_[size_t(x)] = std::min(int(sx) + 1, small_width - 1);
			fx_[size_t(x)] = sx - float(int(sx));
		}
	}

	void row(int y, float *dst)
	{
		float sy = std::clamp((float(y) + 0.5f) * inverse_ - 0.5f, 0.f, float(small_height_ - 1));
		int y0 = int(sy), y1 = std::min(y0 + 1, small_height_ - 1);
		float fy = sy - float(y0);
		const float *t = across(y0, y1), *u = across(y1, y0);
		const size_t width = fx_.size();
		for (size_t x = 0; x < width; ++x)
			dst[x] = t[x] + (u[x] - t[x]) * fy;
	}

	int height() const { return height_; }

private:
	/* Small row `wanted` interpolated across, keeping `other` if held. */
	const float *across(int wanted, int other)
	{
		for (int i = 0; i < 2; ++i)
			if (held_[i] == wanted)
				return across_[i].data();
		const int slot = held_[0] == other ? 1 : 0;
		held_[slot] = wanted;
		const float *src = small_rows_(wanted);
		float *dst = across_[slot].data();
		size_t x = 0;
#if KIT_X86
		if (path_ == Path::AVX2)
			x = across_avx2(src, dst);
#endif
		for (; x < fx_.size(); ++x) {
			const float a = src[x0_[x]], b = src[x1_[x]];
			dst[x] = a + (b - a) * fx_[x];
		}
		return dst;
	}

#if KIT_X86
	/* Eight columns a step. Their neighbours lie within eight floats of
	 * the first one's left neighbour: loaded at once and put in place,
	 * or gathered where that reach passes the row's end. Returns where
	 * the plain loop goes on. */
	__attribute__((target("avx2"))) size_t across_avx2(const float *src, float *dst) const
	{
		const size_t width = fx_.size();
		size_t x = 0;
		for (; x + 8 <= width; x += 8) {
			const __m256i left = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(&x0_[x]));
			const __m256i right = _mm256_loadu_si256(reinterpret_cast<const __m256i *>(&x1_[x]));
			const int first = x0_[x];
			__m256 a, b;
			if (x1_[x + 7] - first < 8 && first + 8 <= small_width_) {
				const __m256 window = _mm256_loadu_ps(src + first);
				const __m256i start = _mm256_set1_epi32(first);
				a = _mm256_permutevar8x32_ps(window, _mm256_sub_epi32(left, start));
				b = _mm256_permutevar8x32_ps(window, _mm256_sub_epi32(right, start));
			} else {
				a = _mm256_i32gather_ps(src, left, 4);
				b = _mm256_i32gather_ps(src, right, 4);
			}
			_mm256_storeu_ps(dst + x, _mm256_add_ps(a, _mm256_mul_ps(_mm256_sub_ps(b, a), _mm256_loadu_ps(&fx_[x]))));
		}
		return x;
	}
#endif

	SmallRows small_rows_;
	int small_width_, small_height_, height_;
	Path path_ = best_path();
	float inverse_;
	std::vector<int> x0_, x1_;
	std::vector<float> fx_;
	Floats across_[2];
	int held_[2] = {-1, -1};
};

/* Bilinear enlargement of a shrunk plane back over `p`. */
inline void expand_into(const Plane &small, int factor, Plane &p)
{
	Expander expander(small, factor, p.width, p.height);
	for (int y = 0; y < p.height; ++y)
		expander.row(y, p.row(y));
}

/* Gaussian blur at full resolution, in place: the exact kernel when narrow,
 * three box passes (each of variance r(r+1)/3) when wide. */
inline void gaussian_blur_full(Plane &p, float sigma);

/* A Gaussian blur of a picture whose rows `rows(y)` hands out, given out a
 * row at a time, in order. A narrow blur convolves rows as they are needed,
 * keeping the 2r + 1 rows blurred across in a ring; a wide one is worked
 * out on a shrunk copy (where it costs a fraction and looks the same) and
 * enlarged row by row, the shrunk rows made and blurred, by the narrow
 * blur, as the enlargement asks for them. Either asks for each row once,
 * in order, a few rows ahead of the row given out. Only a wide blur whose
 * shrunk copy would still need a wide blur (a picture too thin to shrink
 * by the blur's measure) reads every row when it is made. */
class BlurredRows {
public:
	template <class Rows>
	BlurredRows(int width, int height, float sigma, Rows &&rows) : width_(width), height_(height)
	{
		const int factor = std::min({int(sigma / 1.6f), width, height});
		if (factor >= 2) {
			const float small_sigma =
				std::sqrt(std::max(0.f, sigma * sigma - float(factor * factor) / 4.f)) / float(factor);
			const int small_width = (width + factor - 1) / factor, small_height = (height + factor - 1) / factor;
			if (narrow(small_sigma)) {
				/* One shrunk row's sums, the shrunk row, and it blurred. */
				shrunk_ = Floats(size_t(small_width) * 3);
				small_blur_.reset(new BlurredRows(small_width, small_height));
				small_blur_->start_narrow(small_sigma, [this, rows, factor, small_width](int sy) mutable {
					float *row_sum = shrunk_.data(), *row = row_sum + small_width;
					shrink_row(width_, height_, factor, sy, rows, row_sum, row, path_);
					return static_cast<const float *>(row);
				});
				expander_ = std::make_unique<Expander>(
					small_width, small_height,
					[this, small_width](int sy) {
						float *row = shrunk_.data() + 2 * size_t(small_width);
						small_blur_->row(sy, row);
						return static_cast<const float *>(row);
					},
					factor, width, height);
				return;
			}
			small_ = shrink_rows(width, height, factor, rows);
			gaussian_blur_full(small_, small_sigma);
			expander_ = std::make_unique<Expander>(small_, factor, width, height);
			return;
		}
		if (narrow(sigma)) {
			start_narrow(sigma, [rows](int y) mutable { return static_cast<const float *>(rows(y)); });
			return;
		}
		/* No blur, or a wide one on a picture too small to shrink: the
		 * whole plane. */
		whole_ = Plane(width, height);
		for (int y = 0; y < height; ++y) {
			const float *src = rows(y);
			std::copy(src, src + width, whole_.row(y));
		}
		gaussian_blur_full(whole_, sigma);
	}

	/* The generators hold this record's address. */
	BlurredRows(const BlurredRows &) = delete;
	BlurredRows &operator=(const BlurredRows &) = delete;

	void row(int y, float *dst)
	{
		if (expander_) {
			expander_->row(y, dst);
			return;
		}
		if (!ring_.empty()) {
			convolve(y, dst);
			return;
		}
		std::copy(whole_.row(y), whole_.row(y) + width_, dst);
	}

private:
	using Source = std::function<const float *(int)>;

	/* Blurs narrower than this are convolved directly. */
	static bool narrow(float sigma) { return sigma > 0.f && sigma < 2.5f; }

	BlurredRows(int width, int height) : width_(width), height_(height) {}

	void start_narrow(float sigma, Source source)
	{
		taps_ = gaussian_taps(sigma);
		radius_ = int(taps_.size() / 2);
		sources_.resize(taps_.size());
		ring_ = Floats(size_t(2 * radius_ + 1) * size_t(width_));
		line_ = Floats(size_t(width_ + 2 * radius_));
		source_ = std::move(source);
	}

	/* Row j blurred across into its ring slot: the row widened by its
	 * edge values, then the taps added in order over the whole row. */
	void across(int j)
	{
		const float *src = source_(j);
		const int r = radius_;
		std::fill(line_.begin(), line_.begin() + r, src[0]);
		std::copy(src, src + width_, line_.begin() + r);
		std::fill(line_.begin() + r + width_, line_.end(), src[width_ - 1]);
		for (int k = 0; k <= 2 * r; ++k)
			sources_[size_t(k)] = &line_[size_t(k)];
		weighted_sum(sources_.data(), taps_.data(), 2 * r + 1, width_, &ring_[size_t(j % (2 * r + 1)) * size_t(width_)],
			     path_);
	}

	void convolve(int y, float *dst)
	{
		const int r = radius_;
		while (blurred_to_ < std::min(y + r, height_ - 1))
			across(++blurred_to_);
		for (int k = -r; k <= r; ++k) {
			const int j = std::clamp(y + k, 0, height_ - 1);
			sources_[size_t(k + r)] = &ring_[size_t(j % (2 * r + 1)) * size_t(width_)];
		}
		weighted_sum(sources_.data(), taps_.data(), 2 * r + 1, width_, dst, path_);
	}

	int width_, height_;
	Path path_ = best_path();
	Plane small_, whole_;
	Floats shrunk_;
	std::unique_ptr<BlurredRows> small_blur_;
	std::unique_ptr<Expander> expander_;
	std::vector<float> taps_;
	std::vector<const float *> sources_;
	int radius_ = 0;
	int blurred_to_ = -1;
	Floats ring_, line_;
	Source source_;
};

/* Direct separable convolution with a sampled Gaussian, in place. */
inline void gaussian_blur_kernel(Plane &p, float sigma)
{
	Plane blurred(p.width, p.height);
	BlurredRows rows(p.width, p.height, sigma, [&](int y) { return p.row(y); });
	for (int y = 0; y < p.height; ++y)
		rows.row(y, blurred.row(y));
	p.v.swap(blurred.v);
}

inline void gaussian_blur_full(Plane &p, float sigma)
{
	if (sigma <= 0.f)
		return;
	if (sigma < 2.5f) {
		gaussian_blur_kernel(p, sigma);
		return;
	}
	float r = (std::sqrt(4.f * sigma * sigma + 1.f) - 1.f) / 2.f;
	int radius = std::max(1, int(r + 0.5f));
	Plane scratch(p.width, p.height);
	for (int pass = 0; pass < 3; ++pass) {
		box_blur_rows(p, radius);
		box_blur_columns(p, scratch, radius);
		std::swap(p.v, scratch.v);
	}
}

/* Gaussian blur of `src` into `dst` (the same size). */
inline void gaussian_blur(const Plane &src, Plane &dst, float sigma)
{
	BlurredRows rows(src.width, src.height, sigma, [&](int y) { return src.row(y); });
	for (int y = 0; y < src.height; ++y)
		rows.row(y, dst.row(y));
}

/* Gaussian blur in place. */
inline void gaussian_blur(Plane &p, float sigma)
{
	Plane blurred(p.width, p.height);
	gaussian_blur(p, blurred, sigma);
	p.v.swap(blurred.v);
}

/* Sobel gradient magnitude of one row from the rows above and below it
 * (the border repeated across). */
inline void sobel_row(const float *up, const float *mid, const float *down, int w, float *mag)
{
	auto at = [&](int x, int l, int r) {
		float dx = (up[r] + 2.f * mid[r] + down[r]) - (up[l] + 2.f * mid[l] + down[l]);
		float dy = (down[l] + 2.f * down[x] + down[r]) - (up[l] + 2.f * up[x] + up[r]);
		mag[x] = std::sqrt(dx * dx + dy * dy);
	};
	/* The two edge columns apart, so that the inner ones read in order. */
	at(0, 0, std::min(1, w - 1));
	for (int x = 1; x < w - 1; ++x)
		at(x, x - 1, x + 1);
	if (w > 1)
		at(w - 1, w - 2, w - 1);
}

/* Sobel gradient magnitude of a plane into `g` (the same size, not the
 * plane itself), the border repeated. */
inline void sobel_magnitude(const Plane &p, Plane &g)
{
	const int h = p.height;
	for (int y = 0; y < h; ++y)
		sobel_row(p.row(std::max(y - 1, 0)), p.row(y), p.row(std::min(y + 1, h - 1)), p.width, g.row(y));
}

/* Runs a function and turns an allocation failure into a result code, so
 * that no exception crosses the C interface. */
template <typename F>
int guarded(F &&body)
{
	try {
		return body();
	} catch (const std::bad_alloc &) {
		return RESULT_NO_MEMORY;
	}
}

} // namespace kit

#endif
