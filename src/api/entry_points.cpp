// The exported C functions: each forwards to its flow.
#include <cstdlib>
#include <cstring>

#include "api/call_frame.h"
#include "api/flows.h"
#include "viraduve/viraduve.h"

using namespace viraduve::api;

extern "C" {

char* getAutoAnalysisFrameDetection(const char* imageDir, const char* mode, const char*,
                                    const char* imageParas) {
  return autoAnalysisFlow(imageDir, mode, imageParas);
}

char* getBandLaneAnalysis(const char* imageDir, const char* analysisFrame, const char* mode,
                          const void*, const char* imageParas) {
  return bandLaneAnalysisFlow(imageDir, analysisFrame, mode, imageParas);
}

char* getCustomAnalysisFrame(const char* imageDir, const char* analysisFrame, const char* mode,
                             const void*, const char* imageParas) {
  return customAnalysisFrameFlow(imageDir, analysisFrame, mode, imageParas);
}

char* getUpdateBandDetection(const char* imageDir, const char* analysisFrame, const char* mode,
                             const void*, const char* imageParas) {
  return updateBandDetectionFlow(imageDir, analysisFrame, mode, imageParas);
}

char* getRollingBallOnAnalysedData(const char* imageDir, const char* analysisFrame,
                                   const char* mode, const void*, const char* imageParas) {
  return rollingBallFlow(imageDir, analysisFrame, mode, imageParas);
}

char* getRegionAnalysis(const char* imageDir, const char* regions, const char* mode, const void*,
                        const char* imageParas, const char* bgRegion) {
  return regionAnalysisFlow(imageDir, regions, mode, imageParas, bgRegion);
}

char* getTPNAnalysisData(const char* imageDir, const char* analysisFrames, const char* mode,
                         const char* tpnRequest, const char* imageParas) {
  return tpnAnalysisFlow(imageDir, analysisFrames, mode, tpnRequest, imageParas);
}

int convertAndExportImage(const char* imageDir, const char* frames, const char* regions,
                          const char* mode, const void*, const char* exportAttribute,
                          const char* imageParas, const char* overlayList,
                          const char* annotations, int channelStep, const char* tpnFrames,
                          const char* markers, const char* textList, const char* platform) {
  return exportFlow(imageDir, frames, regions, mode, exportAttribute, imageParas, overlayList,
                    annotations, channelStep, tpnFrames, markers, textList, platform);
}

int vitToTiff(const char* source, const char* target) { return vitToTiffFlow(source, target); }

void releaseResult(char* result) {
  if (result == nullptr || result == kErrorAnswer) return;
  std::free(result);
}

}  // extern "C"
