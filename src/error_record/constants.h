// The error constants: the "error_constant" text of a record and its code.
#ifndef QUILLON_ERROR_RECORD_CONSTANTS_H_
#define QUILLON_ERROR_RECORD_CONSTANTS_H_

#include <cstdint>

namespace koerr {

struct ErrorConstant {
  const char* name;
  int32_t code;
};

// The component word of every record this plug-in writes.
inline constexpr const char* kComponent = "quillon";

// The plug-in's own.
inline constexpr ErrorConstant kInternalSoftwareError{"kInternalSoftwareError", -411200};
inline constexpr ErrorConstant kQuillonInternalSoftwareError{"quillon::kInternalSoftwareError", -411200};
inline constexpr ErrorConstant kCommandNotFound{"kCommandNotFound", -411145};
inline constexpr ErrorConstant kInvalidRequestMethodType{"kInvalidRequestMethodType", -411203};
// Arrives only from a lower library; answered with HTTP 202.
inline constexpr int32_t kAcceptedCode = -411125;

// Portable ones.
inline constexpr ErrorConstant koapalerr_memoryFull{"koapalerr_memoryFull", -52000};
inline constexpr ErrorConstant koapalerr_communicationsFault{"koapalerr_communicationsFault", -52003};
inline constexpr ErrorConstant koapalerr_invalidParameter{"koapalerr_invalidParameter", -52005};
inline constexpr ErrorConstant koapalerr_resourceNotFound{"koapalerr_resourceNotFound", -52006};
inline constexpr ErrorConstant koapalerr_objectNameCollision{"koapalerr_objectNameCollision", -52007};
inline constexpr ErrorConstant koapalerr_osFault{"koapalerr_osFault", -52008};

// JSON access.
inline constexpr ErrorConstant jsonErrorsNotAnArray{"jsonErrorsNotAnArray", -52004};
inline constexpr ErrorConstant jsonErrorsTypeMismatch{"jsonErrorsTypeMismatch", -52004};
inline constexpr ErrorConstant jsonErrorsArrayItemOutOfBounds{"jsonErrorsArrayItemOutOfBounds", -52004};
inline constexpr ErrorConstant jsonErrorsNotAnObject{"jsonErrorsNotAnObject", -52004};
inline constexpr ErrorConstant jsonErrorsObjectItemNotFound{"jsonErrorsObjectItemNotFound", -52006};
inline constexpr ErrorConstant jsonErrorsInvalidJSON{"jsonErrorsInvalidJSON", -52005};

// The time service's own codes.
inline constexpr int32_t kPdmAttrNotSetCode = -1074100990;      // attribute unknown or not set
inline constexpr int32_t kPdmTrDoesNotExistCode = -1074100991;  // no such time reference

}  // namespace koerr

#endif  // QUILLON_ERROR_RECORD_CONSTANTS_H_
