/* A mutated PNG with its chunks' CRCs made right again, so that the
 * fuzzer's changes reach the decoding instead of the CRC check. The
 * CRC check itself is reached by inputs that are not PNG files of whole
 * chunks, which are left as they are. */
#ifndef IE_FUZZ_PNG_CRC_H
#define IE_FUZZ_PNG_CRC_H

#include <isa-l/crc.h>

#include <cstring>
#include <vector>

inline std::vector<uint8_t> png_crcs_mended(const uint8_t *data, size_t size)
{
	static const uint8_t signature[] = { 0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n' };
	std::vector<uint8_t> png(data, data + size);
	if (size < sizeof(signature) || memcmp(data, signature, sizeof(signature)) != 0)
		return png;
	for (size_t pos = sizeof(signature); size - pos >= 12;) {
		const size_t length = size_t(png[pos]) << 24 | png[pos + 1] << 16 | png[pos + 2] << 8 | png[pos + 3];
		if (length > size - pos - 12)
			break;
		const uint32_t crc = crc32_gzip_refl(0, &png[pos + 4], length + 4);
		for (int i = 0; i < 4; i++)
			png[pos + 8 + length + size_t(i)] = uint8_t(crc >> (24 - 8 * i));
		pos += 12 + length;
	}
	return png;
}

#endif
