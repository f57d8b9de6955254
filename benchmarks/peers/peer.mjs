// SPDX-License-Identifier: Apache-2.0
// The jobs of the bundle done with what Node programs use, for documents_benchmark.
//
// Takes the same commands as peer.py. The second word is the library: jszip or fflate for packages;
// for texts it is not looked at. And one more:
//
//     read-legacy _ PATH    text file in a charset of its own to the response, in UTF-8
//
// The bundle answers in the file's own charset; converting back to it is spared here.

import fs from 'node:fs';
import readline from 'node:readline';

import {unzipSync, zipSync} from 'fflate';
import iconv from 'iconv-lite';
import jschardet from 'jschardet';
import JSZip from 'jszip';

const OFFICE = 'http://schemas.openxmlformats.org/package/2006';
const RELATIONSHIPS_TYPE = 'application/vnd.openxmlformats-package.relationships+xml';
const HEADER = '<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\n';

// Archives: a name and a content for each entry, in order.

const readers = {
  async jszip(path) {
    const archive = await JSZip.loadAsync(fs.readFileSync(path));
    const entries = new Map();
    for (const [name, file] of Object.entries(archive.files)) {
      entries.set(name, await file.async('nodebuffer'));
    }
    return entries;
  },
  async fflate(path) {
    const files = Object.entries(unzipSync(fs.readFileSync(path)));
    return new Map(files.map(([name, data]) =>
        [name, Buffer.from(data.buffer, data.byteOffset, data.byteLength)]));
  },
};

const writers = {
  async jszip(entries) {
    const archive = new JSZip();
    for (const {name, content, stored} of entries) {
      archive.file(name, content, {compression: stored ? 'STORE' : 'DEFLATE', createFolders: false,
                                   compressionOptions: {level: 6}});
    }
    return archive.generateAsync({type: 'nodebuffer'});
  },
  async fflate(entries) {
    const files = {};
    for (const {name, content, stored} of entries) {
      files[name] = [Buffer.from(content), {level: stored ? 0 : 6}];
    }
    return zipSync(files);
  },
};

// The XML of packages is so regular that expressions find all there is to know.

const unescapeXml = (text) => !text.includes('&') ? text : text
    .replace(/&lt;/g, '<').replace(/&gt;/g, '>').replace(/&quot;/g, '"').replace(/&apos;/g, "'")
    .replace(/&amp;/g, '&');
const escapeXml = (text) => text
    .replace(/&/g, '&amp;').replace(/</g, '&lt;').replace(/"/g, '&quot;');

function elements(xml, tag) {
  const found = [];
  for (const [, attributes] of xml.matchAll(new RegExp(`<${tag}\\s([^>]*)>`, 'g'))) {
    found.push(Object.fromEntries(Array.from(
        attributes.matchAll(/([A-Za-z]+)="([^"]*)"/g), ([, key, value]) => [key, unescapeXml(value)])));
  }
  return found;
}

function relationshipsName(part) {
  const slash = part.lastIndexOf('/') + 1;
  return `${part.slice(0, slash)}_rels/${part.slice(slash)}.rels`;
}

function relationshipsOf(entries, part) {
  const xml = entries.get(relationshipsName(part));
  return !xml ? [] : elements(xml.toString(), 'Relationship').map((r) => (
      {relationshipId: r.Id, relationshipType: r.Type, target: r.Target, targetMode: ''}));
}

async function readPackage(library, path) {
  const entries = await readers[library](path);
  const types = entries.get('[Content_Types].xml').toString();
  const defaults = new Map(elements(types, 'Default').map((d) => [d.Extension, d.ContentType]));
  const overrides = new Map(elements(types, 'Override').map((o) => [o.PartName, o.ContentType]));
  const parts = [];
  for (const [name, data] of entries) {
    if (name === '[Content_Types].xml' || name.endsWith('.rels')) continue;
    const partUri = '/' + name;
    const contentType =
        overrides.get(partUri) ?? defaults.get(name.slice(name.lastIndexOf('.') + 1).toLowerCase());
    const content = contentType.startsWith('image/')
        ? `data:${contentType};base64,${data.toString('base64')}` : data.toString();
    parts.push({content, contentType, partUri, relationship: relationshipsOf(entries, name)});
  }
  return Buffer.from(JSON.stringify(
      {parts, relationships: relationshipsOf(entries, ''), status: true}));
}

const relationshipsXml = (relationships) => HEADER +
    `<Relationships xmlns="${OFFICE}/relationships">` + relationships.map((r) =>
        `<Relationship Id="${escapeXml(r.relationshipId)}" Type="${
            escapeXml(r.relationshipType)}" Target="${escapeXml(r.target)}"/>`).join('') +
    '</Relationships>';

async function writePackage(library, path) {
  const {content: document} = JSON.parse(loaded.toString());
  const entries = [
    {name: '[Content_Types].xml', content: HEADER + `<Types xmlns="${OFFICE}/content-types">` +
        `<Default Extension="rels" ContentType="${RELATIONSHIPS_TYPE}"/>` +
        document.parts.map((part) => `<Override PartName="${escapeXml(part.partUri)}" ContentType="${
            escapeXml(part.contentType)}"/>`).join('') + '</Types>'},
    {name: '_rels/.rels', content: relationshipsXml(document.relationships)}];
  for (const {partUri, contentType, content, relationship} of document.parts) {
    const name = partUri.slice(1);
    const stored = contentType.startsWith('image/') && content.startsWith('data:');
    entries.push({name, stored, content:
        stored ? Buffer.from(content.slice(content.indexOf(',') + 1), 'base64') : content});
    if (relationship.length) {
      entries.push({name: relationshipsName(name), content: relationshipsXml(relationship)});
    }
  }
  fs.writeFileSync(path, await writers[library](entries));
  return Buffer.from('true');
}

function readText(_, path) {
  const data = new TextDecoder('utf-8', {fatal: true}).decode(fs.readFileSync(path));
  return Buffer.from(JSON.stringify({data, status: true}));
}

function readLegacy(_, path) {
  const bytes = fs.readFileSync(path);
  const {encoding} = jschardet.detect(bytes);
  return Buffer.from(JSON.stringify({data: iconv.decode(bytes, encoding), status: true}));
}

const jobs = {'read-package': readPackage, 'write-package': writePackage, 'read-text': readText,
              'read-legacy': readLegacy};
let loaded = Buffer.alloc(0);
let response = null;

for await (const line of readline.createInterface({input: process.stdin})) {
  const [command, ...words] = line.split('\t');
  try {
    response = command === 'save' ? response : null;
    const start = process.hrtime.bigint();
    if (command === 'load') {
      loaded = fs.readFileSync(words[0]);
    } else if (command === 'save') {
      fs.writeFileSync(words[0], response);
    } else {
      response = await jobs[command](words[0], words[1]);
    }
    console.log(String(process.hrtime.bigint() - start));
  } catch (error) {
    console.log('error ' + String(error).replaceAll('\n', ' '));
  }
}
