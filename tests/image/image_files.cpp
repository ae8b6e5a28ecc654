#include "image_files.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <unordered_map>
#include <vector>

namespace iet {

namespace {

using Bytes = std::vector<uint8_t>;

bool write_bytes(const std::string &path, const Bytes &bytes)
{
	std::ofstream out(path, std::ios::binary | std::ios::trunc);
	out.write(reinterpret_cast<const char *>(bytes.data()), (std::streamsize)bytes.size());
	return bool(out);
}

bool read_bytes(const std::string &path, Bytes *bytes)
{
	std::ifstream in(path, std::ios::binary);
	if (!in)
		return false;
	bytes->assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
	return true;
}

void put_le16(Bytes &b, unsigned v)
{
	b.push_back(v & 0xff);
	b.push_back((v >> 8) & 0xff);
}

void put_be32(Bytes &b, uint32_t v)
{
	for (int shift = 24; shift >= 0; shift -= 8)
		b.push_back((v >> shift) & 0xff);
}

/* GIF's variable-width LZW, codes packed from the least significant bit. */
class Lzw_Writer {
public:
	explicit Lzw_Writer(int min_code_size)
		: min_code_size_(min_code_size), clear_(1 << min_code_size), end_(clear_ + 1) { reset(); }

	Bytes encode(const std::vector<uint8_t> &indices)
	{
		emit(clear_);
		int prefix = indices[0];
		for (size_t i = 1; i < indices.size(); i++) {
			uint32_t key = (uint32_t)prefix << 8 | indices[i];
			auto found = table_.find(key);
			if (found != table_.end()) {
				prefix = found->second;
				continue;
			}
			emit(prefix);
			if (next_ < 4096) {
				table_[key] = next_++;
				/* The decoder adds each entry one code later. */
				if (next_ > (1 << width_) && width_ < 12)
					width_++;
			} else {
				emit(clear_);
				reset();
			}
			prefix = indices[i];
		}
		emit(prefix);
		emit(end_);
		if (bit_count_ > 0)
			out_.push_back(bits_ & 0xff);
		return out_;
	}

private:
	void reset()
	{
		table_.clear();
		next_ = end_ + 1;
		width_ = min_code_size_ + 1;
	}

	void emit(int code)
	{
		bits_ |= (uint32_t)code << bit_count_;
		bit_count_ += width_;
		while (bit_count_ >= 8) {
			out_.push_back(bits_ & 0xff);
			bits_ >>= 8;
			bit_count_ -= 8;
		}
	}

	int min_code_size_, clear_, end_;
	int next_ = 0, width_ = 0;
	std::unordered_map<uint32_t, int> table_;
	uint32_t bits_ = 0;
	int bit_count_ = 0;
	Bytes out_;
};

uint32_t crc32_of(const uint8_t *data, size_t size)
{
	uint32_t crc = 0xffffffffu;
	for (size_t i = 0; i < size; i++) {
		crc ^= data[i];
		for (int k = 0; k < 8; k++)
			crc = (crc >> 1) ^ (0xedb88320u & (0u - (crc & 1)));
	}
	return crc ^ 0xffffffffu;
}

void put_png_chunk(Bytes &b, const char *type, const Bytes &data)
{
	put_be32(b, (uint32_t)data.size());
	size_t start = b.size();
	b.insert(b.end(), type, type + 4);
	b.insert(b.end(), data.begin(), data.end());
	put_be32(b, crc32_of(b.data() + start, b.size() - start));
}

} // namespace

bool write_flat_gif(const std::string &path, int w, int h, uint32_t rgb)
{
	Bytes b = { 'G', 'I', 'F', '8', '9', 'a' };
	put_le16(b, w);
	put_le16(b, h);
	b.insert(b.end(), { 0x91, 0, 0 }); /* global table of 4 colours */
	b.insert(b.end(), { uint8_t(rgb >> 16), uint8_t(rgb >> 8), uint8_t(rgb) });
	b.insert(b.end(), { 0, 0, 0, 255, 255, 255, 0, 0, 255 });
	b.push_back(0x2c);
	put_le16(b, 0);
	put_le16(b, 0);
	put_le16(b, w);
	put_le16(b, h);
	b.push_back(0);

	const int min_code_size = 2;
	b.push_back(min_code_size);
	Bytes data = Lzw_Writer(min_code_size).encode(std::vector<uint8_t>((size_t)w * h, 0));
	for (size_t at = 0; at < data.size(); at += 255) {
		size_t n = std::min<size_t>(255, data.size() - at);
		b.push_back((uint8_t)n);
		b.insert(b.end(), data.begin() + at, data.begin() + at + n);
	}
	b.push_back(0);
	b.push_back(0x3b);
	return write_bytes(path, b);
}

bool write_half_wbmp(const std::string &path, int w, int h)
{
	Bytes b = { 0, 0 };
	for (int v : { w, h }) {
		Bytes digits;
		do {
			digits.insert(digits.begin(), v & 0x7f);
			v >>= 7;
		} while (v);
		for (size_t i = 0; i + 1 < digits.size(); i++)
			digits[i] |= 0x80;
		b.insert(b.end(), digits.begin(), digits.end());
	}
	int row_bytes = (w + 7) / 8;
	for (int y = 0; y < h; y++)
		for (int byte = 0; byte < row_bytes; byte++) {
			uint8_t v = 0;
			for (int bit = 0; bit < 8; bit++)
				if (byte * 8 + bit < w / 2)
					v |= 0x80 >> bit;
			b.push_back(v);
		}
	return write_bytes(path, b);
}

bool add_exif_orientation(const std::string &jpeg_path, int orientation)
{
	Bytes jpeg;
	if (!read_bytes(jpeg_path, &jpeg) || jpeg.size() < 2 || jpeg[0] != 0xff || jpeg[1] != 0xd8)
		return false;
	Bytes tiff = { 'I', 'I', 0x2a, 0, 8, 0, 0, 0, /* one IFD entry: */ 1, 0,
		       0x12, 0x01, 3, 0, 1, 0, 0, 0, uint8_t(orientation), 0, 0, 0, /* no next IFD */ 0, 0, 0, 0 };
	Bytes app1 = { 0xff, 0xe1 };
	unsigned length = 2 + 6 + (unsigned)tiff.size();
	app1.push_back(length >> 8);
	app1.push_back(length & 0xff);
	app1.insert(app1.end(), { 'E', 'x', 'i', 'f', 0, 0 });
	app1.insert(app1.end(), tiff.begin(), tiff.end());
	jpeg.insert(jpeg.begin() + 2, app1.begin(), app1.end());
	return write_bytes(jpeg_path, jpeg);
}

bool write_png_header_only(const std::string &path, uint32_t w, uint32_t h)
{
	Bytes b = { 0x89, 'P', 'N', 'G', '\r', '\n', 0x1a, '\n' };
	Bytes ihdr;
	put_be32(ihdr, w);
	put_be32(ihdr, h);
	ihdr.insert(ihdr.end(), { 8, 2, 0, 0, 0 }); /* 8-bit RGB */
	put_png_chunk(b, "IHDR", ihdr);
	put_png_chunk(b, "IEND", {});
	return write_bytes(path, b);
}

bool truncate_file(const std::string &path, double fraction)
{
	std::error_code ec;
	auto size = std::filesystem::file_size(path, ec);
	if (ec)
		return false;
	std::filesystem::resize_file(path, (uintmax_t)(size * fraction), ec);
	return !ec;
}

bool write_text_file(const std::string &path, const std::string &text)
{
	return write_bytes(path, Bytes(text.begin(), text.end()));
}

} // namespace iet
