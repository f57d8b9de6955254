// SPDX-License-Identifier: Apache-2.0
// Which image takes the place of which.

/** The media type of an image, by the bytes it begins with. */
export function imageType(bytes: Uint8Array): string | undefined {
  const head = String.fromCharCode(...bytes.subarray(0, 300));
  if (head.startsWith("\x89PNG\r\n\x1a\n")) {
    return "image/png";
  }
  if (head.startsWith("\xff\xd8\xff")) {
    return "image/jpeg";
  }
  if (/^GIF8[79]a/.test(head)) {
    return "image/gif";
  }
  if (/^BM[^]{4}\0\0\0\0/.test(head)) {
    return "image/bmp";
  }
  if (/^(II\*\0|MM\0\*)/.test(head)) {
    return "image/tiff";
  }
  if (/^RIFF[^]{4}WEBP/.test(head)) {
    return "image/webp";
  }
  if (head.slice(40, 44) === " EMF") {
    return "image/x-emf";
  }
  return /<svg[\s>]/.test(head) ? "image/svg+xml" : undefined;
}

// Those that office programs show wherever one of them stood.
const EXCHANGEABLE = ["image/png", "image/jpeg", "image/jpg", "image/gif", "image/bmp", "image/tiff"];

/** Whether an image of the type `replacement` is shown in the place of one of the type `present`. */
export function mayReplace(present: string, replacement: string): boolean {
  return (
    present === replacement || (EXCHANGEABLE.includes(present.toLowerCase()) && EXCHANGEABLE.includes(replacement))
  );
}
