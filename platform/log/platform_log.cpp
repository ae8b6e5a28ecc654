#include "platform_log.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string>
#include <deque>

namespace {

struct Line {
	int prio;
	std::string tag;
	std::string text;
};

// The record is read by tests on the main loop, but nothing stops a
// decoder thread from logging, so it is locked.
std::mutex record_lock;
// A deque keeps earlier lines in place as lines are added, so the texts
// handed out stay valid until the next clear.
std::deque<Line> record;

int stderr_threshold()
{
	static const int threshold = [] {
		const char *level = getenv("PLATFORM_LOG_LEVEL");
		if (!level || !*level)
			return static_cast<int>(PLATFORM_LOG_WARN);
		switch (level[0]) {
		case 'V': case 'v': return static_cast<int>(PLATFORM_LOG_VERBOSE);
		case 'D': case 'd': return static_cast<int>(PLATFORM_LOG_DEBUG);
		case 'I': case 'i': return static_cast<int>(PLATFORM_LOG_INFO);
		case 'W': case 'w': return static_cast<int>(PLATFORM_LOG_WARN);
		case 'E': case 'e': return static_cast<int>(PLATFORM_LOG_ERROR);
		case 'F': case 'f': return static_cast<int>(PLATFORM_LOG_FATAL);
		default: return static_cast<int>(PLATFORM_LOG_SILENT);
		}
	}();
	return threshold;
}

char priority_letter(int prio)
{
	static constexpr char letters[] = "?VDIWEFS";
	return (prio >= 0 && prio <= PLATFORM_LOG_SILENT) ? letters[prio] : '?';
}

} // namespace

extern "C" int __dlog_vprint(int prio, const char *tag, const char *fmt, va_list ap)
{
	if (!fmt)
		return PLATFORM_ERROR_INVALID_PARAMETER;
	if (!tag)
		tag = "";

	va_list measure;
	va_copy(measure, ap);
	int length = vsnprintf(nullptr, 0, fmt, measure);
	va_end(measure);
	if (length < 0)
		return PLATFORM_ERROR_INVALID_PARAMETER;
	std::string text(static_cast<size_t>(length), '\0');
	vsnprintf(text.data(), text.size() + 1, fmt, ap);

	if (prio >= stderr_threshold())
		fprintf(stderr, "%c/%s: %s\n", priority_letter(prio), tag, text.c_str());

	std::lock_guard<std::mutex> hold(record_lock);
	record.push_back({prio, tag, std::move(text)});
	return length;
}

extern "C" int __dlog_print(int prio, const char *tag, const char *fmt, ...)
{
	va_list ap;
	va_start(ap, fmt);
	int result = __dlog_vprint(prio, tag, fmt, ap);
	va_end(ap);
	return result;
}

extern "C" void platform_log_record_clear(void)
{
	std::lock_guard<std::mutex> hold(record_lock);
	record.clear();
}

extern "C" size_t platform_log_record_count(void)
{
	std::lock_guard<std::mutex> hold(record_lock);
	return record.size();
}

extern "C" int platform_log_record_priority(size_t index)
{
	std::lock_guard<std::mutex> hold(record_lock);
	return index < record.size() ? record[index].prio : 0;
}

extern "C" const char *platform_log_record_tag(size_t index)
{
	std::lock_guard<std::mutex> hold(record_lock);
	return index < record.size() ? record[index].tag.c_str() : nullptr;
}

extern "C" const char *platform_log_record_text(size_t index)
{
	std::lock_guard<std::mutex> hold(record_lock);
	return index < record.size() ? record[index].text.c_str() : nullptr;
}
