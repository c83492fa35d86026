// The process-wide part of libcurl.
#pragma once

namespace http {

// Sets libcurl up, with memory that is overwritten before it is given back: access tokens pass through
// its buffers. Called before libcurl is used, any number of times, from any thread.
void setUpCurlLibrary();

}  // namespace http
