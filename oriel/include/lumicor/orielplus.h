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


/* Facial-subject codes returned by the clustering (Oriel_ClusterSubject).
 * They are decided from the faces' number, sizes and positions; "size" is a
 * face box's height as a fraction of the photo height, "main" faces are
 * those whose area is at least a quarter of the largest face's area.
 *   NO_FACE         no face.
 *   PORTRAIT        one main face of size >= 0.25 (a close portrait).
 *   SINGLE          one main face smaller than that (a person in a scene).
 *   COUPLE          two main faces.
 *   GROUP           three to nine main faces.
 *   CROWD           ten or more main faces.
 *   BACKGROUND_ONLY every face is small (< 0.06) and off-centre (its centre
 *                   outside the middle third of the photo): people who
 *                   happen to be in the picture rather than its subject. */
#define ORIEL_CLUSTER_SUBJECT_PORTRAIT 0x10002u
#define ORIEL_CLUSTER_SUBJECT_SINGLE 0x10003u
#define ORIEL_CLUSTER_SUBJECT_COUPLE 0x10004u
#define ORIEL_CLUSTER_SUBJECT_GROUP 0x10005u
#define ORIEL_CLUSTER_SUBJECT_CROWD 0x10006u
#define ORIEL_CLUSTER_SUBJECT_BACKGROUND_ONLY 0x10007u

/* Dictionary mode bits (engine configuration field 9, values 0..15):
 *   bit 0 (1) parts: the detection calls also locate the 68 landmarks of
 *             each face and fill eyes, part points, rotation and blur;
 *   bit 1 (2) attributes: the detection calls also fill the smile score and
 *             the age range (implies the landmarks, which place the crop);
 *   bit 2 (4) recognition: identity vectors may be made;
 *   bit 3 (8) fast detector: the tiny face detector at two scales instead of
 *             the SSD MobileNet v1 detector (faster, lower recall).
 * Mode 7, which the analysis uses, runs the SSD detector, parts, attributes
 * and recognition. */
#define ORIEL_D_MODE_PARTS 1u
#define ORIEL_D_MODE_ATTRIBUTES 2u
#define ORIEL_D_MODE_RECOGNITION 4u
#define ORIEL_D_MODE_FAST_DETECTOR 8u

/* Status codes of the OrielPlus_* functions. */
enum {
    ORIEL_OK = 0,
    ORIEL_ERR_FAILED = 1,         /* the engine operation reported failure */
    ORIEL_ERR_INVALID = 3,        /* invalid argument */
    ORIEL_ERR_IMAGE = 4,          /* image preparation (or instance allocation) failed */
    ORIEL_ERR_LOCK = 6,           /* locking the engine mutex failed */
    ORIEL_ERR_NOT_LOADED = 7,     /* the engine or the component the call needs is not loaded */
    ORIEL_ERR_CLUSTER_SET = 9,    /* the cluster output already holds a cluster */
    ORIEL_ERR_UNSUPPORTED = 13    /* not supported */
};

/* Opaque face engine instance. */
typedef struct Oriel_Engine* OrielHandle;

/* Pixel format of image arguments. Every mode takes 8 bits per channel. */
typedef enum Oriel_InputColorMode {
    ORIEL_COLOR_GRAY = 0, /* 1 byte per pixel */
    ORIEL_COLOR_BGR = 1,  /* 3 bytes */
    ORIEL_COLOR_RGB = 2,  /* 3 bytes; the photo analysis passes this */
    ORIEL_COLOR_BGRA = 3, /* 4 bytes */
    ORIEL_COLOR_RGBA = 4  /* 4 bytes */
} Oriel_InputColorMode;

/* One face. Positions are fractions: the box of the image width and
 * height, the eyes and part points of the face box (0,0 its top-left,
 * 1,1 its bottom-right).
 *   score      detector confidence, 0..1 (the SSD or tiny detector's
 *              sigmoid score).
 *   blur       sharpness of the face, 0 (sharp) .. 1 (blurred): the mean
 *              absolute Laplacian of the face on a 64 x 64 grey crop divided
 *              by the crop's standard deviation plus 4, mapped linearly so
 *              that 0.55 and above give 0 and 0 gives 1.
 *   roll       in-plane rotation in radians, atan2 of the vector from the
 *              right eye to the left eye (as seen in the photo: from the
 *              image-left eye to the image-right eye); positive when the
 *              face is turned clockwise in the photo.
 *   yaw        asin((dL - dR) / (dL + dR)) where dL, dR are the distances,
 *              along the eye line, from the jaw's image-left and image-right
 *              ends (landmarks 0 and 16) to the nose tip (landmark 30):
 *              about 0 for a frontal face, positive for a face turned to
 *              its own left (the nose moves to the image right).
 *   pitch      asin(clamp(2 (0.55 - r), -1, 1)), r = distance of the nose
 *              tip below the eye line divided by the mouth centre's:
 *              about 0 for a level face, positive for a face looking up.
 *              All three are geometric estimates from 2-D landmarks, not
 *              calibrated head-pose angles.
 *   rightEyeX/Y, leftEyeX/Y  centres of the person's right eye (landmarks
 *              36..41, on the image left for an upright frontal face) and
 *              left eye (42..47).
 *   part1X/Y   nose tip (landmark 30); part2X/Y mouth centre (mean of
 *              landmarks 48..67); both negative when not located.
 *   partLevels 0 nothing located; 2 eyes and both part points, located
 *              from the 68 landmarks. Records given to the engine may also
 *              say 1 (eyes only).
 *   attribute1 smile score 0..100: 100 x the probability of "happy" among
 *              the seven expressions of the expression network; -1 absent.
 *   attribute2 always -1 (absent).
 *   ageMin/ageMax  the age network's estimate a (years) minus and plus
 *              4 + a / 10 years (about its mean absolute error), clamped to
 *              0..99; 255/255 when not estimated.
 *   male       engine field: probability 0..100 that the face is male, 255
 *              when not estimated.
 *   tag        position of the face in its detection call's output (0 =
 *              first). */
typedef struct Oriel_areaInfo {
    float x;
    float y;
    float width;
    float height;
    float roll;
    float pitch;
    float yaw;
    float score;
    float blur;
    float rightEyeX;
    float rightEyeY;
    float leftEyeX;
    float leftEyeY;
    float part1X;
    float part1Y;
    float part2X;
    float part2Y;
    int32_t partLevels;
    double attribute1;
    double attribute2;
    uint8_t ageMin;
    uint8_t ageMax;
    uint8_t male;
    uint8_t reserved;
    int32_t tag;
} Oriel_areaInfo;

/* An array of faces. Arrays filled by the detection calls are one malloc
 * block owned by the engine's caller until OrielPlus_ReleaseArrayMadeByDetectFace. */
typedef struct Oriel_faceAreaArray {
    uint32_t count;
    Oriel_areaInfo* pInfo;
} Oriel_faceAreaArray;

/* A search region of OrielPlus_DetectFaceSpatial, fractions of the image. */
typedef struct Oriel_searchArea {
    float x;
    float y;
    float width;
    float height;
} Oriel_searchArea;

/* Regions to search (count 0: the whole image). */
typedef struct Oriel_areaArray {
    uint32_t count;
    const Oriel_searchArea* pAreas;
} Oriel_areaArray;

/* The 68 landmarks of one face, fractions of its box, in the usual 68-point
 * order (jaw 0..16, brows 17..26, nose 27..35, eyes 36..47, mouth 48..67). */
#define ORIEL_ALL_PARTS 68
typedef struct Oriel_faceAllParts {
    uint32_t count; /* 68 when located, else 0 */
    float x[ORIEL_ALL_PARTS];
    float y[ORIEL_ALL_PARTS];
} Oriel_faceAllParts;

typedef struct Oriel_faceAllPartsArray {
    uint32_t count;
    Oriel_faceAllParts* pParts;
} Oriel_faceAllPartsArray;

/* Identity vector. pVector points to OrielPlus_GetFaceVectorDim 32-bit words
 * that the caller allocates and frees. Their bytes: 0 format (1), 1 length
 * (128), 2..3 zero, 4..7 scale (float32, little-endian), 8..135 the face
 * descriptor, normalised to unit length, as signed bytes q (value = q x
 * scale). 136 bytes: the whole vector fits a 255-byte stored feature. */
#define ORIEL_VECTOR_FORMAT 1u
#define ORIEL_VECTOR_LENGTH 128u
#define ORIEL_VECTOR_BYTES 136u
typedef struct Oriel_faceVectorData {
    uint32_t format;   /* ORIEL_VECTOR_FORMAT once made */
    uint32_t byteSize; /* ORIEL_VECTOR_BYTES once made */
    uint32_t aligned;  /* 1: the crop was aligned on landmarks, 0: on the box */
    uint32_t valid;    /* non-zero when a vector was made */
    uint32_t reserved;
    uint32_t* pVector;
} Oriel_faceVectorData;

typedef struct Oriel_faceVectorArray {
    uint32_t count;
    Oriel_faceVectorData* pVectors;
} Oriel_faceVectorArray;

/* Engine configuration: fourteen 32-bit fields.
 *   workPixels      pixel count the detectors work at: the photo is scaled
 *                   (never enlarged past 2x) so that width x height is about
 *                   this (default 76800, at least 400). The SSD input keeps
 *                   the photo's aspect, sides rounded to multiples of 32; the
 *                   tiny detector runs on the square side (a multiple of 32)
 *                   nearest to the scaled longer side and on 1.5 times it.
 *   scoreThreshold  detection score threshold; values outside (0, 1) keep
 *                   the default 0.5.
 *   minFacePercent  faces whose box is smaller than this percent of the
 *                   photo's shorter side are dropped (default 2).
 *   localScales     scales tried around each candidate by
 *                   OrielPlus_DetectFaceLocal, 1..4 (default 2).
 *   maxFaces        most faces one detection returns, 1..256 (default 64).
 *   nmsPercent      overlap (IoU, percent) above which the local and
 *                   spatial searches merge two detections (default 50).
 *   reserved7, reserved8, reserved11..14  kept as set, unused.
 *   dictionaryMode  0..15, see ORIEL_D_MODE_* (default 7).
 *   flags           kept as set and reported back; no bit is read by this
 *                   engine (the analysis writes 0x107E01F1). */
typedef struct Oriel_engineConfig {
    uint32_t workPixels;
    float scoreThreshold;
    uint32_t minFacePercent;
    uint32_t localScales;
    uint32_t maxFaces;
    uint32_t nmsPercent;
    uint32_t reserved7;
    uint32_t reserved8;
    uint32_t dictionaryMode;
    uint32_t flags;
    uint32_t reserved11;
    uint32_t reserved12;
    uint32_t reserved13;
    uint32_t reserved14;
} Oriel_engineConfig;

/* Per-network configuration record: whether a network is enabled. */
typedef enum Oriel_network {
    ORIEL_NET_SSD = 0,
    ORIEL_NET_TINY = 1,
    ORIEL_NET_LANDMARKS = 2,
    ORIEL_NET_EXPRESSION = 3,
    ORIEL_NET_AGE = 4,
    ORIEL_NET_RECOGNITION = 5,
    ORIEL_NET_COUNT = 6
} Oriel_network;
typedef struct Oriel_engineConfigLayer {
    uint32_t network; /* Oriel_network */
    uint32_t enabled; /* 0: the network is treated as not loaded */
} Oriel_engineConfigLayer;

/* Version record: numbers and the dotted text. */
typedef struct Oriel_verInfo {
    uint32_t major;
    uint32_t minor;
    uint32_t revision;
    char version[16];
} Oriel_verInfo;

/* Cluster record of OrielPlus_GetFacialSubjectOfImageEx (engine-owned). */
typedef struct Oriel_faceSubjectCluster {
    Oriel_ClusterSubject subject;
    uint32_t faceCount;  /* faces considered */
    uint32_t mainFaces;  /* faces counted as main faces */
    uint32_t largest;    /* index of the largest face */
} Oriel_faceSubjectCluster;

/* ORIEL_FUNCTIONS: the OrielPlus_* entry points are declared below.
 *
 * Common rules: image arguments are pixels, width, height, colour mode and
 * row stride in bytes (negative for bottom-up buffers); the pixels are only
 * read. The handle is the last argument. Arguments are checked before the
 * instance is locked (3 on failure, nothing changed); every call except
 * OrielPlus_CalcSimilarity then holds the instance's mutex (6 when locking
 * fails); 7 when the instance or the network the call needs is not loaded;
 * 4 when the image cannot be prepared (size 0 or above 16,000,000 pixels,
 * unknown colour mode, out of memory); 1 when the engine operation fails
 * (out of memory during inference). Detection outputs are emptied (their
 * previous array released, count 0) before detecting. */

/* Creates an instance with all networks. *pHandle = the instance (0) or
 * NULL: 3 pHandle NULL, 4 allocation failed, 7 the networks could not be
 * loaded, 6 the mutex does not work. Release with OrielPlus_Finalize. */
uint32_t OrielPlus_Initialize(OrielHandle* pHandle);
/* Destroys *pHandle and sets it to NULL (0); 3 pHandle or *pHandle NULL.
 * Arrays and clusters made by the instance must be released first. */
uint32_t OrielPlus_Finalize(OrielHandle* pHandle);
/* Constant version records (never NULL): the interface ("1.5.0") and the
 * engine with its networks ("1.0.0"). */
const Oriel_verInfo* OrielPlus_GetLibVersion(void);
const Oriel_verInfo* OrielPlus_GetOrielVersion(void);
/* Always 13: the engine runs on the caller's thread only. */
uint32_t OrielPlus_SetMaxOmpThreads(int32_t threads, OrielHandle handle);

/* Detects the faces of the image into *pOut (a new engine-made array,
 * sorted by descending score; count 0 and NULL when none). The detector
 * runs at the working pixel count; detections scoring between 0.3 x the
 * threshold and the threshold (the best four) get a second look on a
 * window twice their size at 160 x 160 and are kept, with the box of that
 * look, only when it scores above the threshold. What is filled besides box
 * and score follows the dictionary mode. */
uint32_t OrielPlus_DetectFace(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                              int32_t stride, Oriel_faceAreaArray* pOut, OrielHandle handle);
/* As OrielPlus_DetectFace, restricted to the given regions (each searched
 * at the working scale of its own size, overlapping results merged). */
uint32_t OrielPlus_DetectFaceSpatial(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, Oriel_areaArray areas,
                                     Oriel_faceAreaArray* pOut, OrielHandle handle);
/* Confirms candidate boxes: scale k (0 .. localScales - 1) searches a
 * square window centred on the candidate, of side 2 x its longer side /
 * 1.5^k (at least 1.2 x it), with the detector at 192 x 192; a candidate is
 * confirmed by the best-scoring detection overlapping it (IoU >= 0.3).
 * *pOut holds the confirmed faces (the detector's boxes), in candidate
 * order, each at most once. 3 also when pCandidates is NULL or empty. */
uint32_t OrielPlus_DetectFaceLocal(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                   int32_t stride, const Oriel_faceAreaArray* pCandidates, Oriel_faceAreaArray* pOut,
                                   OrielHandle handle);
/* As OrielPlus_DetectFaceLocal for grey images only: any colour mode other
 * than ORIEL_COLOR_GRAY returns 13. */
uint32_t OrielPlus_DetectFaceReferred(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                      Oriel_InputColorMode mode, int32_t stride, const Oriel_faceAreaArray* pCandidates,
                                      Oriel_faceAreaArray* pOut, OrielHandle handle);
/* Locates the landmarks of each face in place: eyes, part points,
 * rotation, blur and partLevels 2. 3 faces NULL or empty. */
uint32_t OrielPlus_PartsLocate(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                               int32_t stride, Oriel_faceAreaArray* pFaces, OrielHandle handle);
/* The 68 landmarks of each face into the caller's pOut->pParts (as many
 * records as faces). 3 NULL arguments or counts that differ. */
uint32_t OrielPlus_AllPartsLocate(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                  int32_t stride, const Oriel_faceAreaArray* pFaces, Oriel_faceAllPartsArray* pOut,
                                  OrielHandle handle);
/* Fills smile score and age range of each face in place (locating the
 * landmarks first where partLevels < 2). 3 faces NULL or empty. */
uint32_t OrielPlus_AttributeClassify(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, Oriel_faceAreaArray* pFaces,
                                     OrielHandle handle);
/* Makes the identity vector of one face into pOut->pVector (the caller's
 * buffer of OrielPlus_GetFaceVectorDim words): the face is cropped on its
 * eyes and mouth centre (located first when partLevels < 2) and described
 * by the recognition network twice, as it is and mirrored; the vector is
 * the normalised sum, so a face and its mirror image get one vector. 3 face or out
 * NULL, pOut->pVector NULL, or a box whose four values sum to 0; 1 when no
 * vector could be made (pOut->valid 0). */
uint32_t OrielPlus_MakeFaceVector(const uint8_t* pPixels, uint32_t width, uint32_t height, Oriel_InputColorMode mode,
                                  int32_t stride, const Oriel_areaInfo* pFace, Oriel_faceVectorData* pOut,
                                  OrielHandle handle);
/* Vectors of many faces: one malloc block of count x dim words is made,
 * *ppBlock set to it (the caller frees it with free()), and each
 * pVectors->pVectors[i].pVector points into it. Faces whose box's shorter
 * side is below minFaceSide pixels, or past the first maxFaces (0: all),
 * get valid 0. 3 width or height 0, NULL arguments, counts that differ or 0. */
uint32_t OrielPlus_MakeFaceVectorEx(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                    Oriel_InputColorMode mode, int32_t stride, const Oriel_faceAreaArray* pFaces,
                                    Oriel_faceVectorArray* pVectors, uint8_t** ppBlock, uint32_t minFaceSide,
                                    uint32_t maxFaces, OrielHandle handle);
/* Keeps a prepared copy of the image for the following image calls with
 * the same pixels, size, mode and stride, until OrielPlus_DisposeCacheBuffer
 * (a new call replaces it). */
uint32_t OrielPlus_CreateCacheBuffer(const uint8_t* pPixels, uint32_t width, uint32_t height,
                                     Oriel_InputColorMode mode, int32_t stride, OrielHandle handle);
uint32_t OrielPlus_DisposeCacheBuffer(OrielHandle handle);
/* Similarity of two made vectors in [0, 1]: the cosine of the two
 * descriptors, negative values given as 0. On the networks' 22 sample
 * faces a face and its mirrored, rescaled (0.5x, 2x), brightened or
 * JPEG-recompressed copy score at least 0.96, two people of one photo at
 * most 0.95. Runs without the lock (it only reads the vectors). 3 NULL
 * arguments, 1 a vector that is not valid or not of this format. */
uint32_t OrielPlus_CalcSimilarity(const Oriel_faceVectorData* pA, const Oriel_faceVectorData* pB, float* pOut,
                                  OrielHandle handle);
/* Highest similarity of pA to the valid vectors of the array (1 when none
 * is valid). 3 NULL arguments or an empty array. */
uint32_t OrielPlus_CalcSimilarityArray(const Oriel_faceVectorData* pA, const Oriel_faceVectorArray* pArray,
                                       float* pOut, OrielHandle handle);
/* Normalised mean of two valid vectors into pOut->pVector (caller's buffer). */
uint32_t OrielPlus_AverageFaceVectors(const Oriel_faceVectorData* pA, const Oriel_faceVectorData* pB,
                                      Oriel_faceVectorData* pOut, OrielHandle handle);
/* *pDim = words of a vector buffer: (136 + 3) / 4 = 34. */
uint32_t OrielPlus_GetFaceVectorDim(uint32_t* pDim, OrielHandle handle);
/* *pSuitable = 1 when the face suits identification in a photo of
 * imageWidth x imageHeight pixels: landmarks located (partLevels 2), box's
 * shorter side at least 40 pixels, |yaw| and |roll| at most 45 degrees;
 * else 0. 3 NULL arguments or partLevels 0 or -1. */
uint32_t OrielPlus_CheckIdentCondition(int32_t imageWidth, int32_t imageHeight, const Oriel_areaInfo* pFace,
                                       int32_t* pSuitable, OrielHandle handle);
/* The facial-subject code (ORIEL_CLUSTER_SUBJECT_*) of faces in a photo of
 * width x height; always 0 with the answer in *pSubject. */
uint32_t OrielPlus_GetFacialSubjectOfImage(uint32_t width, uint32_t height, const Oriel_faceAreaArray* pFaces,
                                           Oriel_ClusterSubject* pSubject, OrielHandle handle);
/* As above, as an engine-owned cluster record (*ppCluster, release with
 * OrielPlus_DisposeFaceSubjectCluster). 9 when *ppCluster is not NULL (it is
 * left as it is); 1 out of memory. */
uint32_t OrielPlus_GetFacialSubjectOfImageEx(uint32_t width, uint32_t height, const Oriel_faceAreaArray* pFaces,
                                             Oriel_faceSubjectCluster** ppCluster, OrielHandle handle);
uint32_t OrielPlus_DisposeFaceSubjectCluster(Oriel_faceSubjectCluster* pCluster, OrielHandle handle);
/* Reads / writes the configuration. Set checks nothing beyond NULL: values
 * out of range are clamped when used. */
uint32_t OrielPlus_GetEngineConfig(Oriel_engineConfig* pConfig, OrielHandle handle);
uint32_t OrielPlus_SetEngineConfig(const Oriel_engineConfig* pConfig, OrielHandle handle);
/* *ppLayers = the instance's table of ORIEL_NET_COUNT records (valid until
 * the next Set call or Finalize), *pCount its length. */
uint32_t OrielPlus_GetEngineConfigLayers(const Oriel_engineConfigLayer** ppLayers, uint32_t* pCount,
                                         OrielHandle handle);
/* Applies the given records (unknown networks are ignored); count 0
 * enables every network again. 3 handle NULL or count > 0 with NULL. */
uint32_t OrielPlus_SetEngineConfigLayers(const Oriel_engineConfigLayer* pLayers, uint32_t count, OrielHandle handle);
/* Frees an engine-made face array and sets it to {0, NULL}. 3 pArray NULL
 * or count 0 with a pointer set (which is left alone). */
uint32_t OrielPlus_ReleaseArrayMadeByDetectFace(Oriel_faceAreaArray* pArray, OrielHandle handle);

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* LUMICOR_ORIELPLUS_H */
