// One request that brings files.

import { ApiError, headersOf, readReply, urlOf } from "./api.js";

const LAST_TIME = 2 ** 32 - 1; // that the server keeps

// By XMLHttpRequest, for fetch() does not tell how far the body is. Resolves with the reply's data, undefined when it
// was aborted. onBegin(request), onProgress({loaded, total})
export function sendFiles({ method, params = {}, type, body, onBegin, onProgress }) {
  return new Promise((resolve, reject) => {
    const request = new XMLHttpRequest();
    onBegin(request);
    request.open(method, urlOf("upload", params));
    if (type) request.setRequestHeader("Content-Type", type);
    for (const [name, value] of Object.entries(headersOf())) request.setRequestHeader(name, value);
    request.upload.addEventListener("progress", onProgress);
    request.addEventListener("load", () => {
      try {
        resolve(readReply(request.status, request.responseText));
      } catch (failure) {
        reject(failure);
      }
    });
    request.addEventListener("error", () => reject(new ApiError({ key: "page:upload_broken" })));
    request.addEventListener("abort", () => resolve());
    request.send(body);
  });
}

// When the file was modified, as the server takes it.
export function modifiedOf({ lastModified }) {
  const seconds = Math.floor(lastModified / 1000);
  return seconds >= 0 && seconds <= LAST_TIME ? seconds : undefined;
}
