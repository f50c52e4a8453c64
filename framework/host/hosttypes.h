// Enumerations shared by the detector library and the host services.
// Plain values; no threading concerns. The enums that carry configuration values have int
// as their underlying type, so that any value a host passes ("any other group") is valid.

#ifndef EVWATCH_FRAMEWORK_HOST_HOSTTYPES_H_
#define EVWATCH_FRAMEWORK_HOST_HOSTTYPES_H_

// HTTP method of VoHttpClient::SendRequest. The detectors use only GET.
enum __tag_VO_HTTP_METHOD { VO_HTTP_GET = 0, VO_HTTP_HEAD = 1 };
typedef __tag_VO_HTTP_METHOD VO_HTTP_METHOD;

// Response header looked up by VoHttpClient::GetHttpContent.
enum __tag_HTTP_MAP_KEY { HTTP_CONTENT_TYPE = 0, HTTP_CONTENT_LENGTH = 1 };
typedef __tag_HTTP_MAP_KEY HTTP_MAP_KEY;

// What a detector that serves both kinds of event watches.
enum EVENT_DET_TYPE : int { EVENT_DET_MOTION = 0, EVENT_DET_INPUT = 1 };

// Vivotek event record in the JPEG header: 0 reads the APP0 form, any other value APP2.
enum VIVO_FUNC_GR : int { VIVO_FUNC_GR_APP0 = 0, VIVO_FUNC_GR_APP2 = 1 };

// Panasonic input-bit layout of the COM segment.
enum PANA_FUNC_GR : int { PANA_FUNC_GR_0 = 0, PANA_FUNC_GR_1 = 1 };

#endif  // EVWATCH_FRAMEWORK_HOST_HOSTTYPES_H_
