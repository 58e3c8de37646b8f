/*
 * orielplus.h - the face engine interface (OrielPlus_* functions) and the
 * records that cross it.
 */
#ifndef LUMICOR_ORIELPLUS_H
#define LUMICOR_ORIELPLUS_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

/* Facial-subject code of a photo: 0 when detection did not run, 0x10001 when
 * no face was found; other codes are documented with the face engine. */
typedef uint32_t Oriel_ClusterSubject;

#define ORIEL_CLUSTER_SUBJECT_NOT_RUN 0u
#define ORIEL_CLUSTER_SUBJECT_NO_FACE 0x10001u

/* Face detection dictionary mode, 0..15 (ORIEL_D_MODE_MAX excluded). */
typedef uint32_t Oriel_DetectDictionaryMode;
#define ORIEL_D_MODE_MAX 16u

/* ORIEL_FUNCTIONS: the OrielPlus_* entry points are declared below. */

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* LUMICOR_ORIELPLUS_H */
