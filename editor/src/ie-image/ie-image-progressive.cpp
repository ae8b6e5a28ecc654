/* Progressive JPEG decoding, the scans into coefficients (their pixels
 * come from ie-image-progressive-pixels.cpp); see ie-image-progressive.h.
 * The scans follow the JPEG standard's progressive mode (spectral selection
 * and successive approximation, end-of-band runs, restart intervals); the
 * checks and the order of operations are those that make the coefficients
 * equal libjpeg's on every file it decodes without a warning. Speed comes
 * from the bit reader (eight bytes at a time where no 0xFF needs
 * unstuffing), from Huffman tables that give a short code and the value
 * that follows it in one look-up, and from keeping, beside the few
 * coefficients the reduced inverse DCT reads, only a mask of which
 * coefficients are non-zero: the refinement scans, most of a progressive
 * file, then pass over the correction bits of the others in bulk, by a
 * step that follows from where each run of zeros ends, and look the next
 * code up before the reader is topped up. */
#include "ie-image-progressive.h"

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <system_error>
#include <thread>
#include <vector>

#include "ie-engine-private.h"

namespace {

using Status = Ie_Progressive_Status;


constexpr int MAX_COMPONENTS = 3;
constexpr int MAX_SAMPLING = 4;
constexpr int MAX_SUCCESSIVE_BITS = 13;

/* ---- Bits ---- */

inline bool has_ff_byte(uint64_t v)
{
	const uint64_t x = ~v;
	return ((x - 0x0101010101010101ull) & ~x & 0x8080808080808080ull) != 0;
}

/* The entropy-coded bytes of one segment (a scan, or one restart interval
 * of it), unstuffed, most significant bit first. Past the segment's end
 * zeros are supplied and counted: a decoding that uses them was given a
 * damaged file. */
struct Bits {
	const uint8_t *p, *end;
	uint64_t buf = 0; /* valid bits at the top */
	int count = 0;
	size_t fake = 0;

	Bits(const uint8_t *from, const uint8_t *to) : p(from), end(to) {}

	/* Tops up to at least 56 bits whatever the count (from 0 to 63):
	 * where no branch on the count is wanted. */
	void refill()
	{
		if (end - p >= 8) {
			uint64_t v;
			memcpy(&v, p, 8);
			if (!has_ff_byte(v)) {
				buf |= __builtin_bswap64(v) >> count;
				p += (63 - count) >> 3;
				count |= 56;
				return;
			}
		}
		while (count < 56) {
			uint64_t byte = 0;
			if (p < end) {
				byte = *p++;
				if (byte == 0xFF)
					p++; /* its stuffed zero */
			} else {
				fake++;
			}
			buf |= byte << (56 - count);
			count += 8;
		}
	}
	/* At least 25 bits are there after this. */
	void ensure()
	{
		if (count < 25)
			refill();
	}
	/* At least 56. */
	void fill()
	{
		if (count < 56)
			refill();
	}
	uint32_t peek(int n) const { return uint32_t(buf >> (64 - n)); }
	void skip(int n)
	{
		buf <<= n;
		count -= n;
	}
	/* n from 1 to 16, with ensure() done. */
	uint32_t take(int n)
	{
		const uint32_t v = peek(n);
		skip(n);
		return v;
	}
	bool overrun() const { return fake * 8 > size_t(count); }
};

inline int extend(uint32_t v, int s)
{
	return v < (1u << (s - 1)) ? int(v) - (1 << s) + 1 : int(v);
}

/* ---- Huffman ---- */

constexpr int FAST_BITS = 10;

/* A refinement symbol as one word: the bit of its zero run (1 << run),
 * the bits still to pass over after its code is looked up (the code and
 * the sign), whether a new coefficient comes and its sign, and that
 * length less the run (biased by 32): with the place the run ends on,
 * the loop knows how far the bit reader moves without counting the
 * corrections in between. */
constexpr uint32_t REFINE_RUN_BIT = 0xFFFF;
constexpr int REFINE_LENGTH_SHIFT = 16;
constexpr uint32_t REFINE_VALUE = 1u << 21, REFINE_NEGATIVE = 1u << 22;
constexpr int REFINE_STEP_SHIFT = 24, REFINE_STEP_BIAS = 32;

constexpr uint32_t refine_symbol(int run, int length, bool value, bool negative)
{
	return uint32_t(1) << run | uint32_t(length) << REFINE_LENGTH_SHIFT | (value ? REFINE_VALUE : 0) |
	       (negative ? REFINE_NEGATIVE : 0) | uint32_t(length - run + REFINE_STEP_BIAS) << REFINE_STEP_SHIFT;
}

inline int refine_length(uint32_t symbol)
{
	return int(symbol >> REFINE_LENGTH_SHIFT) & 31;
}

struct Huffman {
	/* By the next FAST_BITS bits: code length << 8 | symbol; 0 for a
	 * longer code. */
	uint16_t fast[1 << FAST_BITS];
	/* AC tables: the code and the value after it, when both fit: value
	 * (16 bits), zero run (4), total length (5). 0 when they do not. */
	int32_t fast_ac[1 << FAST_BITS];
	/* The same for refinement scans, whose values are one sign bit, as
	 * refine_symbol() words; 0 for an end of band or a code too long. */
	uint32_t fast_refine[1 << FAST_BITS];
	/* First code of each length after the last one, left-aligned to 17
	 * bits (so that a length with no codes is never chosen). */
	uint32_t limit[18];
	int first_code[17], first_index[17];
	uint8_t values[256];
};

bool huffman_build(Huffman *t, const uint8_t counts[16], const uint8_t *values, int total, bool ac)
{
	memcpy(t->values, values, size_t(total));
	memset(t->fast, 0, sizeof(t->fast));
	memset(t->fast_ac, 0, sizeof(t->fast_ac));
	memset(t->fast_refine, 0, sizeof(t->fast_refine));
	uint32_t code = 0;
	int k = 0;
	for (int len = 1; len <= 16; len++) {
		t->first_index[len] = k;
		t->first_code[len] = int(code);
		for (int i = 0; i < counts[len - 1]; i++, k++, code++) {
			/* An over-full table, or a code of all ones, which libjpeg
			 * refuses; checked before the code indexes the table. */
			if (code >= (1u << len) - 1)
				return false;
			if (len > FAST_BITS)
				continue;
			const int span = 1 << (FAST_BITS - len);
			for (int j = 0; j < span; j++)
				t->fast[(code << (FAST_BITS - len)) | uint32_t(j)] = uint16_t(len << 8 | values[k]);
		}
		t->limit[len] = code << (17 - len);
		code <<= 1;
	}
	t->limit[17] = ~0u;
	if (ac) {
		for (uint32_t look = 0; look < (1u << FAST_BITS); look++) {
			const uint16_t e = t->fast[look];
			if (!e)
				continue;
			const int len = e >> 8, symbol = e & 0xFF, run = symbol >> 4, size = symbol & 15;
			if (!size || len + size > FAST_BITS)
				continue;
			const uint32_t bits = (look >> (FAST_BITS - len - size)) & ((1u << size) - 1);
			const int value = extend(bits, size);
			t->fast_ac[look] = int32_t(uint32_t(uint16_t(int16_t(value))) << 16 | uint32_t(run) << 8 |
						   uint32_t(len + size));
		}
		for (uint32_t look = 0; look < (1u << FAST_BITS); look++) {
			const uint16_t e = t->fast[look];
			const int len = e >> 8, symbol = e & 0xFF, run = symbol >> 4, size = symbol & 15;
			if (!e || size > 1 || len + size > FAST_BITS || (!size && run != 15))
				continue;
			const bool negative = size && !((look >> (FAST_BITS - len - 1)) & 1);
			t->fast_refine[look] = refine_symbol(run, len + size, size, negative);
		}
	}
	return true;
}

/* A symbol, or -1 for a code no table holds. ensure() done. */
inline int huffman_decode(Bits &b, const Huffman &t)
{
	const uint16_t e = t.fast[b.peek(FAST_BITS)];
	if (e) {
		b.skip(e >> 8);
		return e & 0xFF;
	}
	const uint32_t c = b.peek(16) << 1;
	int len = FAST_BITS + 1;
	while (c >= t.limit[len])
		len++;
	if (len > 16)
		return -1;
	b.skip(len);
	const int index = t.first_index[len] + int(c >> (17 - len)) - t.first_code[len];
	return index < 256 ? t.values[index] : -1;
}

/* ---- Scans ---- */

/* A scan as read from its header, with everything its decoding needs:
 * the tables as they stood at its start, its entropy-coded bytes. */
struct Scan {
	int count;
	int comp[MAX_COMPONENTS];
	int dc_table[MAX_COMPONENTS], ac_table[MAX_COMPONENTS];
	int ss, se, ah, al;
	const Huffman *dc[MAX_COMPONENTS], *ac;
	int restart_interval;
	const uint8_t *data, *end;
};

/* What runs from block to block within a scan. */
struct Scan_State {
	int dc_pred[MAX_COMPONENTS];
	uint32_t eobrun;
};

/* The bit work of the scans, done three ways: with the processor's
 * population count and bit deposit (its own instructions, chosen at run
 * time, so the code builds for any x86-64), with the count only (where the
 * deposit is slow microcode), and portable. All give the same results. */
enum Bit_Ops { PORTABLE, POPCNT, POPCNT_PDEP };

struct Decoder {
	Ie_Progressive *out;
	/* Every table defined; a scan keeps the ones current at its start. */
	std::vector<std::unique_ptr<Huffman>> tables;
	const Huffman *dc[4] = {}, *ac[4] = {};
	std::vector<Scan> scans;
	uint16_t quant[4][64];
	bool quant_defined[4] = {};
	bool quant_latched[MAX_COMPONENTS] = {};
	int component_table[MAX_COMPONENTS] = {};
	int coef_bits[MAX_COMPONENTS][64];
	int restart_interval = 0;
	bool frame_seen = false;
	/* Per block, which coefficients (zigzag bit k) are non-zero. */
	uint64_t *nonzero[MAX_COMPONENTS] = {};
	int target_w = 0, target_h = 0;
	Bit_Ops ops = PORTABLE;

	~Decoder()
	{
		for (uint64_t *mask : nonzero)
			free(mask);
	}
};

/* One block's kept coefficients and its mask. */
struct Block {
	int16_t *coef;
	uint64_t *nonzero;
	int kept;
};

inline Block block_of(const Decoder &d, int c, int bx, int by)
{
	const Ie_Progressive_Plane &plane = d.out->planes[c];
	const size_t i = ie_progressive_block_index(plane, bx, by);
	return { plane.coefficients + i * size_t(plane.kept), d.nonzero[c] + i, plane.kept };
}

/* Bits k to last of a block's mask. */
inline uint64_t band(int k, int last)
{
	return k > last ? 0 : (~0ull << k) & (~0ull >> (63 - last));
}

#define IE_ALWAYS_INLINE inline __attribute__((always_inline))

template <Bit_Ops Ops> IE_ALWAYS_INLINE int count_bits(uint64_t v)
{
	if constexpr (Ops == PORTABLE) {
		v = v - ((v >> 1) & 0x5555555555555555ull);
		v = (v & 0x3333333333333333ull) + ((v >> 2) & 0x3333333333333333ull);
		v = (v + (v >> 4)) & 0x0F0F0F0F0F0F0F0Full;
		return int((v * 0x0101010101010101ull) >> 56);
	} else {
		uint64_t count;
		__asm__("popcnt %1, %0" : "=r"(count) : "r"(v));
		return int(count);
	}
}

/* The lowest set bit of `v` after the first n, alone, where `n_bit` is
 * 1 << n; 0 if there is none. */
template <Bit_Ops Ops> IE_ALWAYS_INLINE uint64_t nth_bit(uint64_t v, uint64_t n_bit)
{
	if constexpr (Ops == POPCNT_PDEP) {
		uint64_t bit;
		__asm__("pdep %2, %1, %0" : "=r"(bit) : "r"(n_bit), "r"(v));
		return bit;
	} else {
		for (int i = __builtin_ctzll(n_bit); i > 0; i--)
			v &= v - 1;
		return v & (0 - v);
	}
}

/* One block of a scan; false on a code no table holds or a run past the
 * band, which libjpeg would only warn about. */
template <Bit_Ops Ops>
IE_ALWAYS_INLINE bool decode_dc_first(Scan_State &st, Bits &b, const Scan &s, int slot, const Block &block)
{
	b.ensure();
	const int size = huffman_decode(b, *s.dc[slot]);
	if (size < 0 || size > 11)
		return false;
	int diff = 0;
	if (size) {
		b.ensure();
		diff = extend(b.take(size), size);
	}
	/* A running sum past int is damage, as libjpeg has it. */
	if (__builtin_add_overflow(st.dc_pred[slot], diff, &st.dc_pred[slot]))
		return false;
	block.coef[0] = int16_t(uint32_t(st.dc_pred[slot]) << s.al);
	return true;
}

template <Bit_Ops Ops> IE_ALWAYS_INLINE void decode_dc_refine(Bits &b, const Scan &s, const Block &block)
{
	b.ensure();
	if (b.take(1))
		block.coef[0] = int16_t(block.coef[0] | (1 << s.al));
}

/* A first-scan coefficient: kept if the inverse DCT reads it, marked in
 * any case (as the value stored, which the shift may have wrapped). */
inline void put_first(const Block &block, int k, int value, int al)
{
	const int16_t stored = int16_t(uint32_t(value) << al);
	if (k < block.kept)
		block.coef[k] = stored;
	*block.nonzero |= uint64_t(stored != 0) << k;
}

template <Bit_Ops Ops> IE_ALWAYS_INLINE bool decode_ac_first(Scan_State &st, Bits &b, const Scan &s, const Block &block)
{
	if (st.eobrun > 0) {
		st.eobrun--;
		return true;
	}
	const Huffman &t = *s.ac;
	for (int k = s.ss; k <= s.se;) {
		b.ensure();
		const int32_t fast = t.fast_ac[b.peek(FAST_BITS)];
		if (fast) {
			b.skip(fast & 0xFF);
			k += (fast >> 8) & 15;
			if (k > s.se)
				return false;
			put_first(block, k++, int16_t(fast >> 16), s.al);
			continue;
		}
		const int rs = huffman_decode(b, t);
		if (rs < 0)
			return false;
		const int run = rs >> 4, size = rs & 15;
		if (size) {
			k += run;
			if (k > s.se)
				return false;
			b.ensure();
			put_first(block, k++, extend(b.take(size), size), s.al);
		} else if (run == 15) {
			k += 16;
		} else {
			st.eobrun = 1u << run;
			if (run) {
				b.ensure();
				st.eobrun += b.take(run);
			}
			st.eobrun--;
			break;
		}
	}
	return true;
}

/* The bits of `v` in the reverse order. */
inline uint64_t reverse_bits(uint64_t v)
{
	v = ((v >> 1) & 0x5555555555555555ull) | ((v & 0x5555555555555555ull) << 1);
	v = ((v >> 2) & 0x3333333333333333ull) | ((v & 0x3333333333333333ull) << 2);
	v = ((v >> 4) & 0x0F0F0F0F0F0F0F0Full) | ((v & 0x0F0F0F0F0F0F0F0Full) << 4);
	return __builtin_bswap64(v);
}

/* Which places of `which` have their correction bit set, given one bit for
 * each in order, the first at the top of `bits`. */
template <Bit_Ops Ops> IE_ALWAYS_INLINE uint64_t corrections_set(uint64_t bits, uint64_t which)
{
	if constexpr (Ops == POPCNT_PDEP) {
		uint64_t set;
		__asm__("pdep %2, %1, %0" : "=r"(set) : "r"(reverse_bits(bits)), "r"(which));
		return set;
	} else {
		uint64_t set = 0;
		for (; which; which &= which - 1, bits <<= 1)
			set |= (which & (0 - which)) & (0 - (bits >> 63));
		return set;
	}
}

/* The correction bits of coefficients that are not kept: passed over, at
 * once when they are at hand. */
inline void skip_corrections(Bits &b, int n)
{
	if (__builtin_expect(n <= b.count, 1)) {
		b.skip(n);
		return;
	}
	while (n > 0) {
		b.fill();
		const int m = n < 56 ? n : 56;
		b.skip(m);
		n -= m;
	}
}

/* The corrections of the non-zero coefficients `which` (`count` of them):
 * those of kept ones (only near the band's start) noted in *corrected, the
 * rest passed over. The `code` bits of the symbol before them are still
 * to be passed over: in the common case the kept ones are read where they
 * lie and all go in one shift. */
template <Bit_Ops Ops>
IE_ALWAYS_INLINE void correct(Bits &b, uint64_t kept_mask, uint64_t which, int count, int code, uint64_t *corrected)
{
	const uint64_t kept = which & kept_mask;
	const int n = count_bits<Ops>(kept);
	if (__builtin_expect(code + n <= b.count, 1)) {
		*corrected |= corrections_set<Ops>(b.buf << code, kept);
		skip_corrections(b, code + count);
		return;
	}
	b.skip(code);
	for (uint64_t rest = kept; rest; rest &= rest - 1) {
		b.ensure();
		*corrected |= (rest & (0 - rest)) & (0 - uint64_t(b.take(1)));
	}
	skip_corrections(b, count - n);
}

/* What read_refine_symbol gives for an end of band (its run of blocks
 * read) and for damage; every symbol is above both. */
constexpr uint32_t REFINE_END_OF_BAND = 0, REFINE_DAMAGED = 1;

/* The next refinement symbol as refine_symbol() has it, with fill() done.
 * Long codes and ends of band are decoded into the same form, their bits
 * taken. */
IE_ALWAYS_INLINE uint32_t read_refine_symbol(Scan_State &st, Bits &b, const Huffman &t)
{
	const uint32_t symbol = t.fast_refine[b.peek(FAST_BITS)];
	if (symbol)
		return symbol;
	const int rs = huffman_decode(b, t);
	if (rs < 0)
		return REFINE_DAMAGED;
	const int run = rs >> 4, size = rs & 15;
	if (size)
		return size == 1 ? refine_symbol(run, 0, true, !b.take(1)) : REFINE_DAMAGED;
	if (run == 15)
		return refine_symbol(run, 0, false, false);
	st.eobrun = 1u << run;
	if (run)
		st.eobrun += b.take(run);
	return REFINE_END_OF_BAND;
}

/* Correction bits go to the coefficients already non-zero; a new
 * coefficient (of magnitude 1 << al) goes to the zero one that the run of
 * zeros ends on. The places still to come are a mask (`ahead`) from place
 * k; the corrections passed are the places from k to the run's end that
 * are not its zeros, so the reader's step follows from where the run ends
 * without counting them. Two loops: one while the kept coefficients lie
 * ahead, which notes their corrections and new values as masks (put in
 * place once the block is read), then one where only the mask of non-zero
 * coefficients changes, with the fewest values live (most of a progressive
 * file's bits are there). Each code is looked up before the reader is
 * topped up where enough bits are left: the top-up is then off the path
 * from one symbol to the next. A set correction bit adds 1 << al away
 * from zero where that bit is not yet set. False on damage. */
template <Bit_Ops Ops>
__attribute__((noinline)) bool decode_ac_refine(Scan_State &st, Bits &b_io, const Scan &s, const Block &block)
{
	const uint64_t kept_mask = block.kept >= 64 ? ~0ull : (1ull << block.kept) - 1;
	const Huffman &t = *s.ac;
	Bits b = b_io;
	uint64_t nonzero = *block.nonzero, ahead = band(s.ss, s.se);
	uint64_t corrected = 0, added = 0, negative = 0;
	int k = s.ss;
	bool ok = true;
	if (st.eobrun == 0) {
		b.refill();
		uint32_t look = t.fast_refine[b.peek(FAST_BITS)];
		for (bool kept_ahead = k < block.kept; ahead;) {
			const uint32_t symbol = look ? look : read_refine_symbol(st, b, t);
			if (__builtin_expect(symbol <= REFINE_DAMAGED, 0)) {
				ok = symbol != REFINE_DAMAGED;
				break;
			}
			const int step_less_at = int(symbol >> REFINE_STEP_SHIFT) - REFINE_STEP_BIAS - k;
			/* Past the run of zeros to the next one (`next`, a single
			 * bit), or off the band (0, for a run of zeros only). */
			const uint64_t next = nth_bit<Ops>(~nonzero & ahead, symbol & REFINE_RUN_BIT);
			if (__builtin_expect(!next, 0)) {
				ok = !(symbol & REFINE_VALUE);
				const uint64_t rest = nonzero & ahead;
				correct<Ops>(b, kept_mask, rest, count_bits<Ops>(rest), refine_length(symbol), &corrected);
				ahead = 0;
				break;
			}
			const int at = __builtin_ctzll(next);
			const uint64_t value = next & (0 - uint64_t((symbol & REFINE_VALUE) != 0));
			if (kept_ahead) {
				const int length = refine_length(symbol);
				correct<Ops>(b, kept_mask, nonzero & ahead & (next - 1), at + step_less_at - length, length,
					     &corrected);
				added |= value & kept_mask;
				negative |= value & kept_mask & (0 - uint64_t((symbol & REFINE_NEGATIVE) != 0));
				kept_ahead = at + 1 < block.kept;
			} else {
				skip_corrections(b, at + step_less_at);
			}
			nonzero |= value;
			ahead &= 0 - (next << 1);
			k = at + 1;
			const bool short_of_bits = b.count < FAST_BITS;
			look = t.fast_refine[b.peek(FAST_BITS)];
			b.refill();
			if (__builtin_expect(short_of_bits, 0))
				look = t.fast_refine[b.peek(FAST_BITS)];
		}
	}
	if (ok && st.eobrun > 0) {
		b.fill();
		const uint64_t rest = nonzero & ahead;
		correct<Ops>(b, kept_mask, rest, count_bits<Ops>(rest), 0, &corrected);
		st.eobrun--;
	}
	*block.nonzero = nonzero;
	const int p1 = 1 << s.al;
	for (; corrected; corrected &= corrected - 1) {
		int16_t &coef = block.coef[__builtin_ctzll(corrected)];
		if ((coef & p1) == 0)
			coef = int16_t(coef + (coef < 0 ? -p1 : p1));
	}
	for (; added; added &= added - 1) {
		const int at = __builtin_ctzll(added);
		block.coef[at] = int16_t((negative >> at) & 1 ? -p1 : p1);
	}
	b_io = b;
	return ok;
}

/* The end of the entropy-coded bytes from `p`: the next marker other than
 * a stuffed zero (and, within a restart interval, other than the RSTn that
 * ends it, which is found as a marker too). */
const uint8_t *segment_end(const uint8_t *p, const uint8_t *end)
{
	while (p < end) {
		const void *ff = memchr(p, 0xFF, size_t(end - p));
		if (!ff)
			return end;
		p = static_cast<const uint8_t *>(ff);
		if (end - p >= 2 && p[1] == 0x00) {
			p += 2;
			continue;
		}
		return p;
	}
	return end;
}

enum Scan_Kind { INTERLEAVED_DC, DC_FIRST, DC_REFINE, AC_FIRST, AC_REFINE };

/* `count` units of one kind of scan, left to right and rows top down from
 * (*ux, *uy). A loop of its own, with the bit reader in registers: the
 * refinement loop is most of the decoding. */
template <Bit_Ops Ops, Scan_Kind Kind>
__attribute__((noinline)) bool decode_units(const Decoder &d, Scan_State &st, const Scan &s, Bits &bits_io, long count,
					     int units_x, int *ux, int *uy)
{
	Bits bits = bits_io;
	int x = *ux, y = *uy;
	const int c0 = s.comp[0];
	bool ok = true;
	for (long i = 0; i < count && ok; i++) {
		if constexpr (Kind == INTERLEAVED_DC) {
			for (int c = 0; c < s.count && ok; c++) {
				const Ie_Progressive_Plane &plane = d.out->planes[s.comp[c]];
				for (int by = 0; by < plane.v && ok; by++)
					for (int bx = 0; bx < plane.h && ok; bx++) {
						const Block block = block_of(d, s.comp[c], x * plane.h + bx, y * plane.v + by);
						if (s.ah)
							decode_dc_refine<Ops>(bits, s, block);
						else
							ok = decode_dc_first<Ops>(st, bits, s, c, block);
					}
			}
		} else if constexpr (Kind == DC_FIRST) {
			ok = decode_dc_first<Ops>(st, bits, s, 0, block_of(d, c0, x, y));
		} else if constexpr (Kind == DC_REFINE) {
			decode_dc_refine<Ops>(bits, s, block_of(d, c0, x, y));
		} else if constexpr (Kind == AC_FIRST) {
			ok = decode_ac_first<Ops>(st, bits, s, block_of(d, c0, x, y));
		} else {
			ok = decode_ac_refine<Ops>(st, bits, s, block_of(d, c0, x, y));
		}
		if (++x == units_x) {
			x = 0;
			y++;
			/* Data that ran out fails the segment: stop here rather than
			 * walk the rest of a huge picture on zeros. */
			ok = ok && !bits.overrun();
		}
	}
	bits_io = bits;
	*ux = x;
	*uy = y;
	return ok;
}

template <Bit_Ops Ops> Status decode_scan(const Decoder &d, const Scan &s)
{
	const Ie_Progressive &img = *d.out;
	const bool dc = s.ss == 0;
	const bool first = s.ah == 0;
	/* A single-component scan walks that component's own blocks, one a
	 * unit; an interleaved one walks whole MCUs. */
	const Ie_Progressive_Plane &single = img.planes[s.comp[0]];
	const int units_x = s.count == 1 ? single.used_w : img.mcus_x;
	const int units_y = s.count == 1 ? single.used_h : img.mcus_y;
	const long units = long(units_x) * units_y;
	const long interval = s.restart_interval ? s.restart_interval : units;
	const uint8_t *pos = s.data;
	int next_restart = 0;
	long unit = 0;
	int ux = 0, uy = 0;
	while (unit < units) {
		Scan_State st = {};
		/* Without restart intervals the scan is one segment, found already. */
		const uint8_t *seg_end = s.restart_interval ? segment_end(pos, s.end) : s.end;
		Bits bits(pos, seg_end);
		const long stop = std::min(units, unit + interval);
		bool ok;
		const long count = stop - unit;
		if (s.count > 1)
			ok = decode_units<Ops, INTERLEAVED_DC>(d, st, s, bits, count, units_x, &ux, &uy);
		else if (dc && first)
			ok = decode_units<Ops, DC_FIRST>(d, st, s, bits, count, units_x, &ux, &uy);
		else if (dc)
			ok = decode_units<Ops, DC_REFINE>(d, st, s, bits, count, units_x, &ux, &uy);
		else if (first)
			ok = decode_units<Ops, AC_FIRST>(d, st, s, bits, count, units_x, &ux, &uy);
		else
			ok = decode_units<Ops, AC_REFINE>(d, st, s, bits, count, units_x, &ux, &uy);
		unit = stop;
		if (!ok || bits.overrun())
			return Status::NOT_OURS;
		pos = seg_end;
		if (unit < units) {
			/* The interval's RSTn, in turn. */
			if (s.end - pos < 2 || pos[1] != 0xD0 + next_restart)
				return Status::NOT_OURS;
			pos += 2;
			next_restart = (next_restart + 1) & 7;
		}
	}
	return Status::DONE;
}

Status decode_scan_with(Bit_Ops ops, const Decoder &d, const Scan &s)
{
	switch (ops) {
	case POPCNT_PDEP:
		return decode_scan<POPCNT_PDEP>(d, s);
	case POPCNT:
		return decode_scan<POPCNT>(d, s);
	case PORTABLE:
		break;
	}
	return decode_scan<PORTABLE>(d, s);
}

/* Where a scan's entropy-coded bytes end: the first marker after `p` that
 * is not one of its restart markers. */
const uint8_t *scan_end(const uint8_t *p, const uint8_t *end, bool restarts)
{
	for (;;) {
		p = segment_end(p, end);
		if (!restarts || end - p < 2 || p[1] < 0xD0 || p[1] > 0xD7)
			return p;
		p += 2;
	}
}

/* Bit deposit is microcode on the first two Zen generations. */
Bit_Ops best_bit_ops()
{
	static const Bit_Ops ops = [] {
		__builtin_cpu_init();
		if (!__builtin_cpu_supports("popcnt"))
			return PORTABLE;
		if (__builtin_cpu_supports("bmi2") && !__builtin_cpu_is("amdfam17h"))
			return POPCNT_PDEP;
		return POPCNT;
	}();
	return ops;
}

inline int be16(const uint8_t *p)
{
	return p[0] << 8 | p[1];
}

bool power_of_two_ratio(int big, int small)
{
	return small > 0 && big % small == 0 && ((big / small) & (big / small - 1)) == 0;
}

Status read_frame(Decoder &d, const uint8_t *body, int length)
{
	Ie_Progressive &img = *d.out;
	if (d.frame_seen || length < 6 || body[0] != 8)
		return Status::NOT_OURS;
	d.frame_seen = true;
	img.height = be16(body + 1);
	img.width = be16(body + 3);
	img.components = body[5];
	if (!ie_decode_size_ok(img.width, img.height) || (img.components != 1 && img.components != 3) ||
	    length < 6 + 3 * img.components)
		return Status::NOT_OURS;
	img.hmax = img.vmax = 1;
	for (int c = 0; c < img.components; c++) {
		const uint8_t *p = body + 6 + 3 * c;
		Ie_Progressive_Plane &plane = img.planes[c];
		plane.id = p[0];
		plane.h = p[1] >> 4;
		plane.v = p[1] & 15;
		d.component_table[c] = p[2];
		if (plane.h < 1 || plane.h > MAX_SAMPLING || plane.v < 1 || plane.v > MAX_SAMPLING || p[2] > 3)
			return Status::NOT_OURS;
		for (int other = 0; other < c; other++)
			if (img.planes[other].id == plane.id)
				return Status::NOT_OURS;
		img.hmax = std::max(img.hmax, plane.h);
		img.vmax = std::max(img.vmax, plane.v);
	}
	img.mcus_x = (img.width + 8 * img.hmax - 1) / (8 * img.hmax);
	img.mcus_y = (img.height + 8 * img.vmax - 1) / (8 * img.vmax);
	img.scale = 8;
	for (int scale : { 1, 2, 4 })
		if ((long(img.width) * scale + 7) / 8 >= d.target_w && (long(img.height) * scale + 7) / 8 >= d.target_h) {
			img.scale = scale;
			break;
		}
	for (int c = 0; c < img.components; c++) {
		Ie_Progressive_Plane &plane = img.planes[c];
		if (!power_of_two_ratio(img.hmax, plane.h) || !power_of_two_ratio(img.vmax, plane.v))
			return Status::NOT_OURS;
		/* The inverse DCT at nx x ny reads the coefficients below (ny, nx)
		 * in natural order: keep up to the last of them in zigzag order. */
		const int nx = std::min(8, img.scale * img.hmax / plane.h), ny = std::min(8, img.scale * img.vmax / plane.v);
		plane.kept = 1;
		for (int z = 0; z < 64; z++)
			if (IE_JPEG_NATURAL_ORDER[z] % 8 < nx && IE_JPEG_NATURAL_ORDER[z] / 8 < ny)
				plane.kept = z + 1;
		const long comp_w = (long(img.width) * plane.h + img.hmax - 1) / img.hmax;
		const long comp_h = (long(img.height) * plane.v + img.vmax - 1) / img.vmax;
		plane.used_w = int((comp_w + 7) / 8);
		plane.used_h = int((comp_h + 7) / 8);
		plane.blocks_w = img.mcus_x * plane.h;
		plane.blocks_h = img.mcus_y * plane.v;
		const size_t blocks = size_t(plane.blocks_w) * size_t(plane.blocks_h);
		plane.coefficients = static_cast<int16_t *>(calloc(blocks, size_t(plane.kept) * sizeof(int16_t)));
		d.nonzero[c] = static_cast<uint64_t *>(calloc(blocks, sizeof(uint64_t)));
		if (!plane.coefficients || !d.nonzero[c])
			return Status::NOT_OURS;
		for (int k = 0; k < 64; k++)
			d.coef_bits[c][k] = -1;
	}
	return Status::DONE;
}

Status read_huffman_tables(Decoder &d, const uint8_t *p, int length)
{
	while (length > 0) {
		if (length < 17)
			return Status::NOT_OURS;
		const int cls = p[0] >> 4, id = p[0] & 15;
		int total = 0;
		for (int i = 0; i < 16; i++)
			total += p[1 + i];
		if (cls > 1 || id > 3 || total > 256 || length < 17 + total)
			return Status::NOT_OURS;
		std::unique_ptr<Huffman> table(new (std::nothrow) Huffman);
		if (!table || !huffman_build(table.get(), p + 1, p + 17, total, cls == 1))
			return Status::NOT_OURS;
		(cls ? d.ac : d.dc)[id] = table.get();
		d.tables.push_back(std::move(table));
		p += 17 + total;
		length -= 17 + total;
	}
	return Status::DONE;
}

Status read_quant_tables(Decoder &d, const uint8_t *p, int length)
{
	while (length > 0) {
		const int precision = p[0] >> 4, id = p[0] & 15;
		const int size = 1 + 64 * (precision + 1);
		if (precision > 1 || id > 3 || length < size)
			return Status::NOT_OURS;
		for (int k = 0; k < 64; k++)
			d.quant[id][k] = uint16_t(precision ? be16(p + 1 + 2 * k) : p[1 + k]);
		d.quant_defined[id] = true;
		p += size;
		length -= size;
	}
	return Status::DONE;
}

/* The scan header, with libjpeg's checks of the progression: each
 * coefficient's successive approximation continues where the last scan
 * left it, DC before AC. */
Status read_scan(Decoder &d, const uint8_t *p, int length, Scan *s)
{
	const Ie_Progressive &img = *d.out;
	if (!d.frame_seen || length < 1)
		return Status::NOT_OURS;
	s->count = p[0];
	if (s->count < 1 || s->count > img.components || length != 4 + 2 * s->count)
		return Status::NOT_OURS;
	for (int i = 0; i < s->count; i++) {
		const int id = p[1 + 2 * i];
		int c = 0;
		while (c < img.components && img.planes[c].id != id)
			c++;
		if (c == img.components)
			return Status::NOT_OURS;
		for (int j = 0; j < i; j++)
			if (s->comp[j] == c)
				return Status::NOT_OURS;
		s->comp[i] = c;
		s->dc_table[i] = p[2 + 2 * i] >> 4;
		s->ac_table[i] = p[2 + 2 * i] & 15;
		if (s->dc_table[i] > 3 || s->ac_table[i] > 3)
			return Status::NOT_OURS;
	}
	const uint8_t *q = p + 1 + 2 * s->count;
	s->ss = q[0];
	s->se = q[1];
	s->ah = q[2] >> 4;
	s->al = q[2] & 15;
	const bool dc = s->ss == 0;
	if (dc ? s->se != 0 : (s->se < s->ss || s->se > 63 || s->count != 1))
		return Status::NOT_OURS;
	if (s->al > MAX_SUCCESSIVE_BITS || (s->ah != 0 && s->ah != s->al + 1))
		return Status::NOT_OURS;
	/* Blocks of an interleaved scan: at most 10 an MCU. */
	if (s->count > 1) {
		int blocks = 0;
		for (int i = 0; i < s->count; i++)
			blocks += img.planes[s->comp[i]].h * img.planes[s->comp[i]].v;
		if (blocks > 10)
			return Status::NOT_OURS;
	}
	for (int i = 0; i < s->count; i++) {
		const int c = s->comp[i];
		if (!dc && d.coef_bits[c][0] < 0)
			return Status::NOT_OURS;
		for (int k = s->ss; k <= s->se; k++) {
			const int expected = d.coef_bits[c][k] < 0 ? 0 : d.coef_bits[c][k];
			if (s->ah != expected)
				return Status::NOT_OURS;
			d.coef_bits[c][k] = s->al;
		}
		/* The table a component is dequantised with is the one defined
		 * when its first scan starts. */
		if (!d.quant_latched[c]) {
			const int table = d.component_table[c];
			if (!d.quant_defined[table])
				return Status::NOT_OURS;
			memcpy(d.out->planes[c].quant, d.quant[table], sizeof(d.quant[table]));
			d.quant_latched[c] = true;
		}
		const bool needs_dc = dc && s->ah == 0, needs_ac = !dc;
		s->dc[i] = d.dc[s->dc_table[i]];
		s->ac = d.ac[s->ac_table[0]];
		if ((needs_dc && !s->dc[i]) || (needs_ac && !s->ac))
			return Status::NOT_OURS;
	}
	return Status::DONE;
}

/* The scans in their order, or in two chains at once where threads are
 * allowed: the chroma components' AC scans touch nothing any other scan
 * does (the DC scans write only each block's first coefficient), so both
 * chains give the very coefficients one would. */
Status decode_scans(const Decoder &d, Ie_Decode_Stop stop, void *stop_data)
{
	std::atomic<bool> abandoned{ false };
	auto chroma_ac = [](const Scan &s) { return s.ss > 0 && s.comp[0] != 0; };
	auto run = [&](int chain) {
		/* Chain 0: all scans, or those of the luma and every DC scan; 1: the
		 * chroma AC scans. */
		for (const Scan &s : d.scans) {
			if (chain == 1 ? !chroma_ac(s) : chain == 0 && chroma_ac(s))
				continue;
			if (abandoned.load(std::memory_order_relaxed))
				return Status::CANCELLED;
			const Status status = decode_scan_with(d.ops, d, s);
			/* Only this thread may ask; the other stops with it. */
			const bool stopped = chain != 1 && stop && stop(stop_data);
			if (status != Status::DONE || stopped) {
				abandoned.store(true, std::memory_order_relaxed);
				return status != Status::DONE ? status : Status::CANCELLED;
			}
		}
		return Status::DONE;
	};
	const bool split = iel_thread_count() > 1 && std::any_of(d.scans.begin(), d.scans.end(), chroma_ac);
	if (!split)
		return run(-1);
	Status other = Status::DONE;
	std::thread helper;
	try {
		helper = std::thread([&] { other = run(1); });
	} catch (const std::system_error &) {
		other = run(1);
	}
	const Status own = run(0);
	if (helper.joinable())
		helper.join();
	/* A failure outranks a stop: the file then goes to libjpeg. */
	if (own == Status::NOT_OURS || other == Status::NOT_OURS)
		return Status::NOT_OURS;
	return own != Status::DONE ? own : other;
}

} // namespace

Ie_Progressive_Status ie_progressive_read(const uint8_t *data, size_t size, int target_w, int target_h,
					  Ie_Decode_Stop stop, void *stop_data, Ie_Progressive *out, bool portable)
{
	memset(out, 0, sizeof(*out));
	if (size < 4 || data[0] != 0xFF || data[1] != 0xD8)
		return Status::NOT_OURS;
	auto *d = new (std::nothrow) Decoder();
	if (!d)
		return Status::NOT_OURS;
	d->out = out;
	d->target_w = target_w;
	d->target_h = target_h;
	d->ops = portable ? PORTABLE : best_bit_ops();
	const uint8_t *pos = data + 2, *end = data + size;
	Status status = Status::NOT_OURS;
	for (;;) {
		/* Fill bytes may come before a marker. */
		while (pos < end && *pos == 0xFF && end - pos >= 2 && pos[1] == 0xFF)
			pos++;
		if (end - pos < 2 || pos[0] != 0xFF)
			break;
		const uint8_t marker = pos[1];
		pos += 2;
		if (marker == 0xD9) {
			status = d->frame_seen ? Status::DONE : Status::NOT_OURS;
			break;
		}
		/* Markers without a length (RSTn, TEM) belong inside scans. */
		if ((marker >= 0xD0 && marker <= 0xD7) || marker == 0x01)
			break;
		if (end - pos < 2)
			break;
		const int length = be16(pos);
		if (length < 2 || end - pos < length)
			break;
		const uint8_t *body = pos + 2;
		pos += length;
		Status step = Status::DONE;
		if (marker == 0xC2)
			step = read_frame(*d, body, length - 2);
		else if ((marker >= 0xC0 && marker <= 0xCF && marker != 0xC4 && marker != 0xCC) || marker == 0xDC)
			step = Status::NOT_OURS; /* other frame kinds, arithmetic coding, DNL */
		else if (marker == 0xC4)
			step = read_huffman_tables(*d, body, length - 2);
		else if (marker == 0xDB)
			step = read_quant_tables(*d, body, length - 2);
		else if (marker == 0xDD)
			d->restart_interval = length == 4 ? be16(body) : -1;
		else if (marker == 0xDA) {
			Scan scan;
			step = read_scan(*d, body, length - 2, &scan);
			if (step == Status::DONE) {
				scan.restart_interval = d->restart_interval;
				scan.data = pos;
				scan.end = scan_end(pos, end, d->restart_interval > 0);
				pos = scan.end;
				try {
					d->scans.push_back(scan);
				} catch (const std::bad_alloc &) {
					step = Status::NOT_OURS;
				}
			}
		}
		if (d->restart_interval < 0)
			step = Status::NOT_OURS;
		if (step != Status::DONE) {
			status = step;
			break;
		}
	}
	if (status == Status::DONE)
		status = decode_scans(*d, stop, stop_data);
	delete d;
	return status;
}

void ie_progressive_free(Ie_Progressive *p)
{
	for (Ie_Progressive_Plane &plane : p->planes) {
		free(plane.coefficients);
		plane.coefficients = nullptr;
	}
}
