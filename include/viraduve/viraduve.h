/* viraduve: analysis of electrophoresis gels and western blots.
 *
 * Every text argument is a zero-terminated byte string; a null pointer reads as the empty
 * text (except bgRegion of getRegionAnalysis, where null means "no background region").
 * The text entry points answer with one of:
 *   - a JSON text in a block from malloc, which the caller frees (free or releaseResult);
 *   - a null pointer when a JSON argument does not parse or the mode is refused;
 *   - the constant text "error" when the analysis failed (do not free it; releaseResult
 *     ignores it).
 * Diagnostics are written to standard output. Calls on different captures may run from
 * several threads at once.
 */
#ifndef VIRADUVE_VIRADUVE_H
#define VIRADUVE_VIRADUVE_H

#if defined(VIRADUVE_BUILDING)
#define VIRADUVE_API __attribute__((visibility("default")))
#else
#define VIRADUVE_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* Finds the frames of the capture, their lanes and bands, and measures every band. */
VIRADUVE_API char* getAutoAnalysisFrameDetection(const char* imageDir, const char* mode,
                                                 const char* unused, const char* imageParas);
/* Measures the bands of the lanes given in analysisFrame. */
VIRADUVE_API char* getBandLaneAnalysis(const char* imageDir, const char* analysisFrame,
                                       const char* mode, const void* unused,
                                       const char* imageParas);
/* Finds lanes and bands inside the frame given in analysisFrame, then measures them. */
VIRADUVE_API char* getCustomAnalysisFrame(const char* imageDir, const char* analysisFrame,
                                          const char* mode, const void* unused,
                                          const char* imageParas);
/* Finds the bands of the lanes marked for update again, then measures them. */
VIRADUVE_API char* getUpdateBandDetection(const char* imageDir, const char* analysisFrame,
                                          const char* mode, const void* unused,
                                          const char* imageParas);
/* Re-measures the bands against a per-lane rolling-ball background. */
VIRADUVE_API char* getRollingBallOnAnalysedData(const char* imageDir, const char* analysisFrame,
                                                const char* mode, const void* unused,
                                                const char* imageParas);
/* Measures user-drawn rectangles and circles; answers under "cloud_region_list". */
VIRADUVE_API char* getRegionAnalysis(const char* imageDir, const char* regions, const char* mode,
                                     const void* unused, const char* imageParas,
                                     const char* bgRegion);
/* Total-protein normalisation of the lanes named in tpnRequest. */
VIRADUVE_API char* getTPNAnalysisData(const char* imageDir, const char* analysisFrames,
                                      const char* mode, const char* tpnRequest,
                                      const char* imageParas);
/* Renders the capture with overlays into imageDir/output; 0 on success, -1 on failure. */
VIRADUVE_API int convertAndExportImage(const char* imageDir, const char* frames,
                                       const char* regions, const char* mode, const void* unused,
                                       const char* exportAttribute, const char* imageParas,
                                       const char* overlayList, const char* annotations,
                                       int channelStep, const char* tpnFrames,
                                       const char* markers, const char* textList,
                                       const char* platform);
/* Converts an image file to the format of the target's extension; 1 written, -1 not. */
VIRADUVE_API int vitToTiff(const char* source, const char* target);
/* Frees a text answer; ignores a null pointer and the constant "error". */
VIRADUVE_API void releaseResult(char* result);

#ifdef __cplusplus
}
#endif

#endif /* VIRADUVE_VIRADUVE_H */
