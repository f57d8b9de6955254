// SPDX-License-Identifier: Apache-2.0
// Paths, and what they say of a document.

export function nameOf(path: string): string {
  return path.slice(path.replace(/\/+$/, "").lastIndexOf("/") + 1) || path;
}

export function folderOf(path: string): string {
  return path.slice(0, path.lastIndexOf("/")) || "/";
}

export function join(folder: string, name: string): string {
  return folder.endsWith("/") ? folder + name : `${folder}/${name}`;
}

const PACKAGES = /\.(doc|dot|xls|xlt|ppt|pps|pot)[xm]$|\.(xlam|ppam|sldx|sldm|vsdx|vstx|vssx|xps|oxps)$/i;

const IMAGES = /\.(png|jpe?g|gif|webp|bmp|avif)$/i;

/** Whether a document at `path` is an image that is no text, by its name. */
export function isImage(path: string): boolean {
  return IMAGES.test(path);
}

/** Whether a document at `path` is a package, by its name. */
export function isPackage(path: string): boolean {
  return PACKAGES.test(path);
}
