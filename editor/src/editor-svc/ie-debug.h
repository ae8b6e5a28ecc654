/* Logging and parameter guards of the editor: every line goes to the
 * platform log as "file: function(line) > <colour>message<reset>". */
#ifndef IE_DEBUG_H
#define IE_DEBUG_H

#include <platform_log.h>

#define IE_LOG_TAG "IV-EDITOR"

#define IE_COLOR_RED "\033[31m"
#define IE_COLOR_CYAN "\033[36m"
#define IE_COLOR_GREEN "\033[32m"
#define IE_COLOR_RESET "\033[0m"

#define IE_LOG_PRINT(prio, colour, fmt, ...) \
	__dlog_print(prio, IE_LOG_TAG, "%s: %s(%d) > " colour fmt IE_COLOR_RESET, \
		     __FILE_NAME__, __func__, __LINE__, ##__VA_ARGS__)

#define IE_LOG_E(fmt, ...) IE_LOG_PRINT(PLATFORM_LOG_ERROR, IE_COLOR_RED, fmt, ##__VA_ARGS__)
#define IE_LOG_W(fmt, ...) IE_LOG_PRINT(PLATFORM_LOG_WARN, IE_COLOR_CYAN, fmt, ##__VA_ARGS__)
#define IE_LOG_I(fmt, ...) IE_LOG_PRINT(PLATFORM_LOG_INFO, IE_COLOR_GREEN, fmt, ##__VA_ARGS__)

/* Guards for a pointer a function cannot work without. `name` is the text
 * shown in the second line, as "!(name)". */
#define IE_GUARD_(ptr, name, what, ...) \
	do { \
		if (!(ptr)) { \
			IE_LOG_E("Invalid parameter, " what); \
			IE_LOG_E("(%s) -> %s() return", "!(" name ")", __func__); \
			return __VA_ARGS__; \
		} \
	} while (0)

#define IE_CHECK_AS(ptr, name) IE_GUARD_(ptr, name, "return!")
#define IE_CHECK_NULL_AS(ptr, name) IE_GUARD_(ptr, name, "return NULL!", NULL)
#define IE_CHECK_VAL_AS(ptr, name, val) IE_GUARD_(ptr, name, "return ERROR code!", val)

#define IE_CHECK(ptr) IE_CHECK_AS(ptr, #ptr)
#define IE_CHECK_NULL(ptr) IE_CHECK_NULL_AS(ptr, #ptr)
#define IE_CHECK_VAL(ptr, val) IE_CHECK_VAL_AS(ptr, #ptr, val)

#endif
