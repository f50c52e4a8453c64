// The digital-input CGI that Axis cameras and the makers that copied their interface (AVIPC,
// AirLive, Zavio) serve: GET <path>?checkactive=N answers one text line, "inputN=active" or
// "inputN=inactive". Each maker's emulation calls it with its own path and media type.
//
// Threads: called on server connection threads, several at once; it only reads the state.

#ifndef EVWATCH_SIM_MAKERS_INPUTQUERY_H_
#define EVWATCH_SIM_MAKERS_INPUTQUERY_H_

#include <string_view>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"

namespace evsim {

// When the request is a GET of `path` (without its query), answers it and returns true:
// 200 with `content_type` and the line for input N when the query is checkactive=N with N in
// 1..kInputCount, else 400. Returns false, writing nothing, for any other request.
bool AnswerInputQuery(HttpConnection& connection, const CameraState& state,
                      std::string_view path, std::string_view content_type);

}  // namespace evsim

#endif  // EVWATCH_SIM_MAKERS_INPUTQUERY_H_
