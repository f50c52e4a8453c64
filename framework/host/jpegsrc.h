// The host's JPEG input services for libjpeg's IJG 62 API: an in-memory source manager and an
// error manager that long-jumps back to the caller instead of exiting or printing.
//
// Use (one decompressor per thread; these functions keep no state of their own):
//
//   JpegErrorJump error;                 // caller-owned; outlives every library call below
//   jpeg_decompress_struct cinfo;
//   SetJpegExit(&cinfo, &error);
//   if (setjmp(error.jump) != 0) { ...; jpeg_destroy_decompress(&cinfo); return failure; }
//   jpeg_CreateDecompress(&cinfo, JPEG_LIB_VERSION, sizeof(cinfo));
//   JpegMemSrc(&cinfo, data, length);
//   jpeg_read_header(&cinfo, TRUE); ...
//   jpeg_destroy_decompress(&cinfo);
//
// The jump leaves the library's objects as they were at the error: the caller still owns
// the decompressor and must destroy it. Between setjmp and the library calls the caller's
// frame must hold no C++ objects with destructors (longjmp skips them), and the variables
// it changes there and reads after the jump must be volatile.

#ifndef EVWATCH_FRAMEWORK_HOST_JPEGSRC_H_
#define EVWATCH_FRAMEWORK_HOST_JPEGSRC_H_

#include <csetjmp>
#include <cstddef>
#include <cstdio>

#include <jpeglib.h>

// An error manager with the place to jump back to. `mgr` must stay the first member: the
// error exit finds the jmp_buf from the library's error-manager pointer.
struct JpegErrorJump {
  jpeg_error_mgr mgr;
  jmp_buf jump;  // set by the caller with setjmp before the first library call
};

// Points cinfo->err at error->mgr, set up with the library's defaults except that an error
// long-jumps to error->jump (with value 1) and no message, error or warning, is ever printed.
// May be called before jpeg_CreateDecompress/jpeg_CreateCompress (which keep cinfo->err).
// REQUIRES: error outlives every use of cinfo.
void SetJpegExit(j_decompress_ptr cinfo, JpegErrorJump* error);
void SetJpegExit(j_compress_ptr cinfo, JpegErrorJump* error);

// Makes the `length` bytes at `data` the decompressor's input. The bytes are read in place
// and never past `length`: input that ends early ends as if an EOI marker followed (with a
// warning, which SetJpegExit keeps silent), so a truncated frame fails or ends cleanly.
// Null data or a zero length is a library error (JERR_INPUT_EMPTY). The manager lives in
// the decompressor's permanent pool and goes with jpeg_destroy_decompress.
// REQUIRES: jpeg_CreateDecompress done; data stays unchanged until the decompressor is
// destroyed or given another source.
void JpegMemSrc(j_decompress_ptr cinfo, const unsigned char* data, unsigned long length);

#endif  // EVWATCH_FRAMEWORK_HOST_JPEGSRC_H_
