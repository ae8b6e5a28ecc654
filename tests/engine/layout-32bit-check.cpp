/* Compiled for a 32-bit target only (no code is produced): the byte layout
 * the closed effect engine reads on the device. */
#include <stddef.h>

#include "IEL_Types.h"

static_assert(sizeof(void *) == 4, "compiled for a 32-bit target");
static_assert(offsetof(IEL_EffectParam, u16EffectId) == 0 && offsetof(IEL_EffectParam, u16Reserved) == 2 &&
		      offsetof(IEL_EffectParam, ps32Option) == 4 && offsetof(IEL_EffectParam, pstTexture) == 8 &&
		      offsetof(IEL_EffectParam, au32Reserved) == 12 && sizeof(IEL_EffectParam) == 24,
	      "IEL_EffectParam: id 0, option 4, texture 8, three zero words from 12; 24 bytes");
static_assert(offsetof(IEL_Image, u32Width) == 0 && offsetof(IEL_Image, u32Height) == 4 &&
		      offsetof(IEL_Image, eFormat) == 8 && offsetof(IEL_Image, pbBuf) == 12 && sizeof(IEL_Image) == 16,
	      "IEL_Image: width 0, height 4, format 8, pixels 12; 16 bytes");
