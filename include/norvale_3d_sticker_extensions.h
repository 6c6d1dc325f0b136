/* SPDX-License-Identifier: MIT */
/*
 * Norvale 3-D sticker engine: what goes beyond the engine interface.
 *
 * Nothing in this header acts unless it is called. It lets a host choose between two trackers, tell
 * the camera's focal length and the times of its frames, bound the time a failing fit may take, and
 * ask who the faces of the last frame were and how well they fit.
 *
 *   Norvale_3DSticker_Options options = {sizeof(options), N3DS_TRACKER_STEADY, 0, 0, 0.5f, 0};
 *   Norvale_3DSticker_SetOptions(engine, &options);
 *   ...
 *   Norvale_3DSticker_SetFrameTime(engine, nanoseconds);
 *   Norvale_3DSticker_Process(engine, &image, ...);
 *
 * Which tracker: docs/extensions.md; how the steady one works: docs/steady.md.
 *
 * The functions belong to the engine they are called with: as for frame calls, one engine must not
 * be used from two threads at once.
 */
#ifndef NORVALE_3D_STICKER_EXTENSIONS_H
#define NORVALE_3D_STICKER_EXTENSIONS_H

#include "norvale_3d_sticker_engine.h"

enum {
  N3DS_EXPRESSION_COUNT = 20, /* expressions of the face model */
  N3DS_IDENTITY_COUNT = 16    /* identity modes of the face model */
};

/* Trackers a host can choose. */
enum {
  N3DS_TRACKER_CLASSIC = 0, /* fits each frame and smooths the results: the default */
  N3DS_TRACKER_STEADY = 1   /* one filter over pose, person and expression: stiller and truer */
};

/* What a host can choose. An engine starts with {24, N3DS_TRACKER_CLASSIC, 0, 0, 0.5, 0}. */
typedef struct Norvale_3DSticker_Options {
  uint32_t size;       /* sizeof(Norvale_3DSticker_Options), set by the host before every call */
  uint32_t tracker;    /* N3DS_TRACKER_CLASSIC or N3DS_TRACKER_STEADY */
  uint32_t refitLimit; /* rigid frames of the classic tracker: how often a failed fit of a face is
                          repeated before it is given up; 0: without a limit */
  float focalLength;   /* pixels of the delivered image, both trackers and the projection matrix;
                          0: (width + height) / 2 */
  float smoothing;  /* steady tracker: 0 (follows at once) to 1 (stands still), 0.5 is balanced */
  uint32_t workers; /* steady tracker: 0: as many threads as faces and processors allow, none for
                          one face; 1: the calling thread alone */
} Norvale_3DSticker_Options;

/* What the engine knows of a face of the last frame. */
typedef struct Norvale_3DSticker_Face_State {
  uint64_t id;            /* the person, as long as the face is followed, and when it is found again
                             within 2 s; from 1, never used twice in an engine's life */
  uint32_t framesTracked; /* frames in a row the face has been fitted in, this one included; 0 while
                             it has not been fitted */
  uint32_t isNew;         /* 1 in the frame that began the track, else 0 */
  float misfit;           /* root mean square distance of the inner landmarks from the fitted face,
                             pixels */
  float confidence;       /* 0 to 1; 0: the landmarks are those of no face, or not of this one, and
                             the results are the last good ones */
  float headPosition[3];  /* origin of the model frame in the camera frame, mm */
  float yaw;              /* degrees; positive: the nose points to the image right */
  float pitch;            /* degrees; positive: up */
  float roll;             /* degrees; positive: clockwise in the image */
  float expression[N3DS_EXPRESSION_COUNT]; /* 0 at rest, 1 fully there */
  float identity[N3DS_IDENTITY_COUNT];     /* standard deviations of the population */
} Norvale_3DSticker_Face_State;

#ifdef __cplusplus
extern "C" {
#endif

/* Chooses how the following frames are tracked.
 *
 * May be called before or after initialisation; takes effect with the next frame and outlives
 * Norvale_3DSticker_Uninitialize. When the tracker changes, faces keep their identifiers and their
 * places: stickers move by no more than the two trackers differ.
 *
 *   engine   handle
 *   options  what to choose; only read
 *
 * Returns N3DS_OK, or, with nothing changed,
 *   N3DS_NULL_ENGINE    engine is null
 *   N3DS_NULL_ARGUMENT  options is null
 *   N3DS_BAD_VALUE      size is not that of a known record, or a member is out of range or not
 *                       finite */
N3DS_API MRESULT Norvale_3DSticker_SetOptions(void* engine,
                                              const Norvale_3DSticker_Options* options);

/* Tells what has been chosen.
 *
 *   engine   handle
 *   options  receives the options; size must be set
 *
 * Returns N3DS_OK, or, with nothing changed,
 *   N3DS_NULL_ENGINE    engine is null
 *   N3DS_NULL_ARGUMENT  options is null
 *   N3DS_BAD_VALUE      size is not that of a known record */
N3DS_API MRESULT Norvale_3DSticker_GetOptions(void* engine, Norvale_3DSticker_Options* options);

/* Tells when the next frame was taken.
 *
 * The steady tracker predicts and smooths per second with it; for both trackers it is what the 2 s
 * count in, for which a face that is gone is remembered. A frame without a time is taken to come
 * 1/30 s after the last. The time of the last call before a frame counts; times start afresh after
 * Norvale_3DSticker_Uninitialize.
 *
 *   engine       handle
 *   nanoseconds  on any clock that does not run backwards
 *
 * Returns N3DS_OK, or, with nothing changed,
 *   N3DS_NULL_ENGINE  engine is null
 *   N3DS_BAD_VALUE    the last frame was later */
N3DS_API MRESULT Norvale_3DSticker_SetFrameTime(void* engine, int64_t nanoseconds);

/* Tells who the faces of the last successful frame were, in the order in which they were passed in.
 *
 *   engine     handle
 *   states     receives the first `capacity` faces; may be null if capacity is 0
 *   stateSize  sizeof(Norvale_3DSticker_Face_State)
 *   capacity   records that states has room for
 *   count      receives the number of faces, even if it is more than capacity
 *
 * Returns N3DS_OK, or, with nothing written,
 *   N3DS_NULL_ENGINE      engine is null
 *   N3DS_NULL_ARGUMENT    count is null, or states is null with capacity > 0
 *   N3DS_BAD_VALUE        stateSize is not that of a known record
 *   N3DS_NOT_INITIALIZED  the engine is not initialised */
N3DS_API MRESULT Norvale_3DSticker_GetFaceStates(void* engine, Norvale_3DSticker_Face_State* states,
                                                 uint32_t stateSize, uint32_t capacity,
                                                 uint32_t* count);

/* The name of an expression, such as "jaw_open"; static storage.
 *
 *   index  0 to N3DS_EXPRESSION_COUNT - 1, as in Norvale_3DSticker_Face_State
 *
 * Returns null if index is out of range. */
N3DS_API const char* Norvale_3DSticker_GetExpressionName(uint32_t index);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif
