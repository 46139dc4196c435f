/* A host outside the project, built against the installed tree. */
#include <stdio.h>

#include <viraduve/viraduve.h>

int main(void) {
  /* An unknown mode is refused with a null pointer. */
  char* answer = getAutoAnalysisFrameDetection(".", "Unknown", "", "{\"ImageParas\": []}");
  if (answer != NULL) {
    releaseResult(answer);
    fprintf(stderr, "expected a refusal\n");
    return 1;
  }
  releaseResult(NULL);
  if (vitToTiff("/nonexistent/source.tif", "/nonexistent/target.tif") != -1) {
    fprintf(stderr, "expected a failed conversion\n");
    return 1;
  }
  printf("consumer ok\n");
  return 0;
}
