// SPDX-License-Identifier: Apache-2.0
// What the tests of a text's form need, in one bundle: two of the editor's state library would not do.
export * from "../../web/src/text/charsets/index.js";
export * from "../../web/src/text/draft.js";
export * from "../../web/src/text/file_form.js";
export * from "../../web/src/text/lines.js";
export { history, redo, undo } from "@codemirror/commands";
export { ChangeSet, EditorState } from "@codemirror/state";
