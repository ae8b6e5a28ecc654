/* IEL_Reduce_Image and the row-fed reducer under it: area-average reduction
 * of BGRA pictures, each output pixel the mean of the source area it covers,
 * border pixels counted by the part of them that is covered (the box filter
 * of a true area resample). Rows may be fed as they come out of a decoder,
 * so no full-size copy of the source is ever held.
 * Arithmetic is integer only, so every path gives the same bytes: the part
 * of a source pixel inside an output pixel is exact in units of 1/(output
 * size); each output pixel's weights are those parts in Q14, rounded, with
 * the rounding error put on its largest weight so that they sum to exactly
 * 1.0. Columns of the rows that fall on one output row are summed first
 * (Q14), rounded to Q7 (at most 32640), then summed across with the column
 * weights (Q21) and rounded half up to 8 bits. All four bytes, alpha too,
 * are averaged alike (premultiplied pixels stay premultiplied).
 * Checks first: null records or pixels, an empty side, an output larger
 * than the source on either side, or a size whose bytes cannot be
 * addressed are refused; nothing is written then. Edge policy: none is
 * needed, every weight lies inside the source. */
#include <immintrin.h>
#include <string.h>

#include <algorithm>
#include <new>
#include <vector>

#include "ie-engine-private.h"

namespace {

constexpr int kWeightBits = 14;
constexpr uint32_t kWeightOne = 1u << kWeightBits;
/* Column sums are narrowed from Q14 to Q7 before the row pass. */
constexpr int kNarrowBits = 7;
constexpr int kOutputBits = kWeightBits + (kWeightBits - kNarrowBits);

/* The weights of one output pixel over `count` source pixels (or rows) from
 * `first`: source pixel i spans [i * out, (i + 1) * out), output pixel o
 * spans [o * in, (o + 1) * in), in units of 1 / (in * out) of the side. */
void area_weights(uint64_t o, uint64_t in, uint64_t out, uint32_t *first, std::vector<uint32_t> &weights)
{
	const uint64_t lo = o * in, hi = (o + 1) * in;
	const uint64_t start = lo / out, end = (hi - 1) / out;
	weights.clear();
	uint32_t sum = 0;
	size_t largest = 0;
	for (uint64_t i = start; i <= end; i++) {
		const uint64_t overlap = std::min(hi, (i + 1) * out) - std::max(lo, i * out);
		const uint32_t w = static_cast<uint32_t>((overlap * kWeightOne + in / 2) / in);
		if (weights.empty() || w > weights[largest])
			largest = weights.size();
		weights.push_back(w);
		sum += w;
	}
	weights[largest] += kWeightOne - sum;
	*first = static_cast<uint32_t>(start);
}

}

/* Tables shared by every path: built once per reducer. */
struct IEL_Reducer {
	uint32_t src_w = 0, src_h = 0, dst_w = 0, dst_h = 0;
	uint8_t *dst = nullptr;
	int simd = 0;
	/* Columns: output x reads `taps` source pixels from column_first[x]
	 * (moved left near the right edge so the reads stay inside), with
	 * weights column_weight[x * taps + j], zero where it covers nothing. */
	uint32_t taps = 0;
	std::vector<uint32_t> column_first;
	std::vector<int16_t> column_weight;
	/* Rows: source row i adds row_weight[2 i] to output row row_target[i]
	 * and row_weight[2 i + 1] to the one after; output row y is complete
	 * after source row row_last[y]. */
	std::vector<uint32_t> row_target, row_weight, row_last;
	/* Column sums of the output row being gathered and of the next. */
	std::vector<uint32_t> sums[2];
	bool fresh[2] = { true, true };
	std::vector<uint16_t> narrowed;
	uint32_t next_row = 0, next_output = 0;
};

/* Sums of one output row: sums = weight x row (`start`), or += otherwise. */
void iel_reduce_gather_reference(uint32_t *sums, const uint8_t *row, size_t count, uint32_t weight, int start)
{
	for (size_t i = 0; i < count; i++)
		sums[i] = (start ? 0 : sums[i]) + weight * row[i];
}

/* Q14 column sums to Q7, then the column weights across: one output row. */
void iel_reduce_emit_reference(const IEL_Reducer *r, const uint32_t *sums, uint16_t *narrowed, uint8_t *out)
{
	const size_t channels = static_cast<size_t>(r->src_w) * 4;
	for (size_t i = 0; i < channels; i++)
		narrowed[i] = static_cast<uint16_t>((sums[i] + (1u << (kNarrowBits - 1))) >> kNarrowBits);
	for (uint32_t x = 0; x < r->dst_w; x++) {
		const uint16_t *from = narrowed + static_cast<size_t>(r->column_first[x]) * 4;
		const int16_t *weight = &r->column_weight[static_cast<size_t>(x) * r->taps];
		for (int c = 0; c < 4; c++) {
			uint32_t total = 0;
			for (uint32_t j = 0; j < r->taps; j++)
				total += static_cast<uint32_t>(weight[j]) * from[j * 4 + c];
			out[x * 4 + c] = static_cast<uint8_t>((total + (1u << (kOutputBits - 1))) >> kOutputBits);
		}
	}
}

__attribute__((target("avx2"))) void iel_reduce_gather_avx2(uint32_t *sums, const uint8_t *row, size_t count,
							     uint32_t weight, int start)
{
	const __m256i w = _mm256_set1_epi32(static_cast<int>(weight));
	size_t i = 0;
	for (; i + 8 <= count; i += 8) {
		const __m256i bytes = _mm256_cvtepu8_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(row + i)));
		__m256i value = _mm256_mullo_epi32(bytes, w);
		if (!start)
			value = _mm256_add_epi32(value, _mm256_loadu_si256(reinterpret_cast<const __m256i *>(sums + i)));
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(sums + i), value);
	}
	iel_reduce_gather_reference(sums + i, row + i, count - i, weight, start);
}

/* Two output pixels a step, a pair of taps at a time: the pair's channels
 * are interleaved so that one multiply-add gives each channel's two
 * products summed. Sums stay below 2^31 (32640 x 16384 in all). */
__attribute__((target("avx2"))) void iel_reduce_emit_avx2(const IEL_Reducer *r, const uint32_t *sums,
							   uint16_t *narrowed, uint8_t *out)
{
	const size_t channels = static_cast<size_t>(r->src_w) * 4;
	const __m256i half_narrow = _mm256_set1_epi32(1 << (kNarrowBits - 1));
	size_t i = 0;
	for (; i + 16 <= channels; i += 16) {
		const __m256i a = _mm256_srli_epi32(
			_mm256_add_epi32(_mm256_loadu_si256(reinterpret_cast<const __m256i *>(sums + i)), half_narrow), kNarrowBits);
		const __m256i b = _mm256_srli_epi32(
			_mm256_add_epi32(_mm256_loadu_si256(reinterpret_cast<const __m256i *>(sums + i + 8)), half_narrow),
			kNarrowBits);
		/* packus works within 128-bit lanes: put the halves back in order. */
		const __m256i packed = _mm256_permute4x64_epi64(_mm256_packus_epi32(a, b), 0xD8);
		_mm256_storeu_si256(reinterpret_cast<__m256i *>(narrowed + i), packed);
	}
	for (; i < channels; i++)
		narrowed[i] = static_cast<uint16_t>((sums[i] + (1u << (kNarrowBits - 1))) >> kNarrowBits);

	/* Within each 128-bit lane: tap j's four channels and tap j+1's,
	 * reordered to b b g g r r a a. */
	const __m256i interleave = _mm256_setr_epi8(0, 1, 8, 9, 2, 3, 10, 11, 4, 5, 12, 13, 6, 7, 14, 15,
						    0, 1, 8, 9, 2, 3, 10, 11, 4, 5, 12, 13, 6, 7, 14, 15);
	const __m256i half_out = _mm256_set1_epi32(1 << (kOutputBits - 1));
	const uint32_t taps = r->taps, paired = taps & ~1u;
	uint32_t x = 0;
	for (; x + 2 <= r->dst_w; x += 2) {
		const uint16_t *from0 = narrowed + static_cast<size_t>(r->column_first[x]) * 4;
		const uint16_t *from1 = narrowed + static_cast<size_t>(r->column_first[x + 1]) * 4;
		const int16_t *w0 = &r->column_weight[static_cast<size_t>(x) * taps];
		const int16_t *w1 = w0 + taps;
		__m256i total = _mm256_setzero_si256();
		uint32_t j = 0;
		for (; j < paired; j += 2) {
			const __m256i pixels = _mm256_shuffle_epi8(
				_mm256_setr_m128i(_mm_loadu_si128(reinterpret_cast<const __m128i *>(from0 + j * 4)),
						  _mm_loadu_si128(reinterpret_cast<const __m128i *>(from1 + j * 4))),
				interleave);
			const __m256i weights = _mm256_setr_m128i(
				_mm_set1_epi32(static_cast<int>(static_cast<uint16_t>(w0[j]) | static_cast<uint32_t>(w0[j + 1]) << 16)),
				_mm_set1_epi32(static_cast<int>(static_cast<uint16_t>(w1[j]) | static_cast<uint32_t>(w1[j + 1]) << 16)));
			total = _mm256_add_epi32(total, _mm256_madd_epi16(pixels, weights));
		}
		if (j < taps) {
			const __m256i pixels = _mm256_setr_m128i(
				_mm_cvtepu16_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(from0 + j * 4))),
				_mm_cvtepu16_epi32(_mm_loadl_epi64(reinterpret_cast<const __m128i *>(from1 + j * 4))));
			const __m256i weights = _mm256_setr_m128i(_mm_set1_epi32(w0[j]), _mm_set1_epi32(w1[j]));
			total = _mm256_add_epi32(total, _mm256_mullo_epi32(pixels, weights));
		}
		const __m256i rounded = _mm256_srli_epi32(_mm256_add_epi32(total, half_out), kOutputBits);
		const __m128i words = _mm_packus_epi32(_mm256_castsi256_si128(rounded), _mm256_extracti128_si256(rounded, 1));
		_mm_storel_epi64(reinterpret_cast<__m128i *>(out + x * 4), _mm_packus_epi16(words, words));
	}
	for (; x < r->dst_w; x++) {
		const uint16_t *from = narrowed + static_cast<size_t>(r->column_first[x]) * 4;
		const int16_t *weight = &r->column_weight[static_cast<size_t>(x) * taps];
		for (int c = 0; c < 4; c++) {
			uint32_t total = 0;
			for (uint32_t j = 0; j < taps; j++)
				total += static_cast<uint32_t>(weight[j]) * from[j * 4 + c];
			out[x * 4 + c] = static_cast<uint8_t>((total + (1u << (kOutputBits - 1))) >> kOutputBits);
		}
	}
}

IEL_Reducer *iel_reducer_new(uint32_t src_w, uint32_t src_h, uint32_t dst_w, uint32_t dst_h, uint8_t *dst,
			     int simd)
{
	IEL_Reducer *r = new (std::nothrow) IEL_Reducer();
	if (!r)
		return nullptr;
	try {
		r->src_w = src_w;
		r->src_h = src_h;
		r->dst_w = dst_w;
		r->dst_h = dst_h;
		r->dst = dst;
		r->simd = simd;
		std::vector<uint32_t> weights;
		std::vector<std::vector<uint32_t>> columns(dst_w);
		for (uint32_t x = 0; x < dst_w; x++) {
			area_weights(x, src_w, dst_w, &r->column_first.emplace_back(), weights);
			columns[x] = weights;
			r->taps = std::max(r->taps, static_cast<uint32_t>(weights.size()));
		}
		/* The AVX2 path reads taps in pairs. */
		r->taps = std::min(src_w, (r->taps + 1) & ~1u);
		r->column_weight.assign(static_cast<size_t>(dst_w) * r->taps, 0);
		for (uint32_t x = 0; x < dst_w; x++) {
			const uint32_t first = std::min(r->column_first[x], src_w - r->taps);
			const uint32_t shift = r->column_first[x] - first;
			for (size_t j = 0; j < columns[x].size(); j++)
				r->column_weight[static_cast<size_t>(x) * r->taps + shift + j] = static_cast<int16_t>(columns[x][j]);
			r->column_first[x] = first;
		}

		r->row_target.assign(src_h, 0);
		r->row_weight.assign(static_cast<size_t>(src_h) * 2, 0);
		r->row_last.assign(dst_h, 0);
		for (uint32_t y = 0; y < dst_h; y++) {
			uint32_t first = 0;
			area_weights(y, src_h, dst_h, &first, weights);
			for (size_t j = 0; j < weights.size(); j++) {
				const uint32_t i = first + static_cast<uint32_t>(j);
				/* A row reaching into two output rows meets the upper
				 * one first. */
				if (j == 0 && i > 0 && y > 0 && r->row_target[i] == y - 1 && r->row_last[y - 1] == i)
					r->row_weight[2 * i + 1] = weights[j];
				else {
					r->row_target[i] = y;
					r->row_weight[2 * i] = weights[j];
				}
			}
			r->row_last[y] = first + static_cast<uint32_t>(weights.size()) - 1;
		}
		const size_t channels = static_cast<size_t>(src_w) * 4;
		r->sums[0].assign(channels, 0);
		r->sums[1].assign(channels, 0);
		r->narrowed.assign(channels, 0);
	} catch (const std::bad_alloc &) {
		delete r;
		return nullptr;
	}
	return r;
}

void iel_reducer_push(IEL_Reducer *r, const uint8_t *rows, uint32_t count)
{
	const size_t channels = static_cast<size_t>(r->src_w) * 4;
	auto gather = r->simd ? iel_reduce_gather_avx2 : iel_reduce_gather_reference;
	auto emit = r->simd ? iel_reduce_emit_avx2 : iel_reduce_emit_reference;
	for (uint32_t k = 0; k < count && r->next_row < r->src_h; k++, r->next_row++) {
		const uint8_t *row = rows + k * channels;
		const uint32_t i = r->next_row, y = r->row_target[i];
		for (uint32_t part = 0; part < 2; part++) {
			const uint32_t weight = r->row_weight[2 * i + part];
			const uint32_t target = y + part;
			if (part == 1 && !weight)
				break;
			const int slot = target & 1;
			gather(r->sums[slot].data(), row, channels, weight, r->fresh[slot]);
			r->fresh[slot] = false;
		}
		while (r->next_output < r->dst_h && r->row_last[r->next_output] <= i) {
			const int slot = r->next_output & 1;
			emit(r, r->sums[slot].data(), r->narrowed.data(),
			     r->dst + static_cast<size_t>(r->next_output) * r->dst_w * 4);
			r->fresh[slot] = true;
			r->next_output++;
		}
	}
}

void iel_reducer_free(IEL_Reducer *r)
{
	delete r;
}

int IEL_Reducer_Create(uint32_t src_width, uint32_t src_height, IEL_Image *dst, IEL_Reducer **reducer)
{
	if (!dst || !reducer)
		return IEL_ERR_INVALID_PARAM;
	*reducer = nullptr;
	if (!src_width || !src_height || !dst->u32Width || !dst->u32Height)
		return IEL_ERR_INVALID_SIZE;
	if (dst->eFormat != IEL_FORMAT_BGRA8888)
		return IEL_ERR_UNSUPPORTED_FORMAT;
	int src_ok = 0, dst_ok = 0;
	iel_byte_count(src_width, src_height, 4, &src_ok);
	iel_byte_count(dst->u32Width, dst->u32Height, 4, &dst_ok);
	if (!src_ok || !dst_ok || dst->u32Width > src_width || dst->u32Height > src_height)
		return IEL_ERR_INVALID_SIZE;
	if (!dst->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	*reducer = iel_reducer_new(src_width, src_height, dst->u32Width, dst->u32Height, dst->pbBuf, iel_cpu_has_avx2());
	if (!*reducer) {
		IEL_LOG_E("reducer tables not allocated");
		return IEL_ERR_ALLOC;
	}
	return IEL_OK;
}

int IEL_Reducer_Push(IEL_Reducer *reducer, const uint8_t *rows, uint32_t count)
{
	if (!reducer || (count && !rows))
		return IEL_ERR_INVALID_PARAM;
	iel_reducer_push(reducer, rows, count);
	return IEL_OK;
}

void IEL_Reducer_Destroy(IEL_Reducer *reducer)
{
	iel_reducer_free(reducer);
}

int IEL_Reduce_Image(const IEL_Image *src, IEL_Image *dst)
{
	if (!src || !dst)
		return IEL_ERR_INVALID_PARAM;
	if (src->eFormat != IEL_FORMAT_BGRA8888)
		return IEL_ERR_UNSUPPORTED_FORMAT;
	if (src->u32Width && src->u32Height && !src->pbBuf)
		return IEL_ERR_INVALID_PARAM;
	IEL_Reducer *reducer = nullptr;
	const int result = IEL_Reducer_Create(src->u32Width, src->u32Height, dst, &reducer);
	if (result != IEL_OK)
		return result;
	iel_reducer_push(reducer, src->pbBuf, src->u32Height);
	iel_reducer_free(reducer);
	return IEL_OK;
}
