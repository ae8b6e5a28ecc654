/* Seams through which the tests make the effect view's work fail as it can
 * in the field: an allocation refused, an effect the libraries refuse. In
 * the editor both stay null. */
#ifndef IE_EFFECT_HOOKS_H
#define IE_EFFECT_HOOKS_H

#include <stddef.h>

struct Ie_Effect_Hooks {
	/* True refuses the pixel buffer of `bytes`. */
	bool (*refuse_buffer)(size_t bytes);
	/* The effect code run for catalogue row `row` instead of its own. */
	int (*effect_code)(int row);
};

extern Ie_Effect_Hooks ie_effect_hooks;

#endif
