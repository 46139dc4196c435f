// The flows behind the exported functions (entry_points.cpp only forwards to these).
#pragma once

namespace viraduve {
namespace api {

char* autoAnalysisFlow(const char* imageDir, const char* mode, const char* imageParas);
char* bandLaneAnalysisFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                           const char* imageParas);
char* customAnalysisFrameFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                              const char* imageParas);
char* updateBandDetectionFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                              const char* imageParas);
char* rollingBallFlow(const char* imageDir, const char* analysisFrame, const char* mode,
                      const char* imageParas);
char* regionAnalysisFlow(const char* imageDir, const char* regions, const char* mode,
                         const char* imageParas, const char* bgRegion);
char* tpnAnalysisFlow(const char* imageDir, const char* analysisFrames, const char* mode,
                      const char* tpnRequest, const char* imageParas);
int exportFlow(const char* imageDir, const char* frames, const char* regions, const char* mode,
               const char* exportAttribute, const char* imageParas, const char* overlayList,
               const char* annotations, int channelStep, const char* tpnFrames,
               const char* markers, const char* textList, const char* platform);
int vitToTiffFlow(const char* source, const char* target);

}  // namespace api
}  // namespace viraduve
