// Reads a keyed archive of a string-to-data dictionary with an outside parser and prints
// what it finds as JSON: {archiver, version, rootIsUid, entries: {key: hex of data}}.
// Exits 1 with a message when the structure is not what the platform's unarchiver expects.
'use strict';
const fs = require('fs');
const bplist = require('bplist-parser');

function fail(message) {
  console.error(message);
  process.exit(1);
}

const [top] = bplist.parseBuffer(fs.readFileSync(process.argv[2]));
const objects = top.$objects;
const isUid = (v) => v !== null && typeof v === 'object' && typeof v.UID === 'number';
if (!Array.isArray(objects) || objects[0] !== '$null') fail('$objects does not start with $null');
const root = top.$top && top.$top.root;
if (!isUid(root)) fail('$top.root is not a UID');
const dict = objects[root.UID];
if (!isUid(dict.$class)) fail('the root has no class');
const cls = objects[dict.$class.UID];
if (!Array.isArray(cls.$classes) || !cls.$classes.includes('NSDictionary')) {
  fail('the root is no dictionary: ' + cls.$classname);
}
if (dict['NS.keys'].length !== dict['NS.objects'].length) fail('keys and objects differ');
const entries = {};
dict['NS.keys'].forEach((keyRef, i) => {
  const key = objects[keyRef.UID];
  const value = objects[dict['NS.objects'][i].UID];
  if (typeof key !== 'string') fail('a key is not a string');
  if (!Buffer.isBuffer(value)) fail('a value is not data');
  entries[key] = value.toString('hex');
});
console.log(JSON.stringify({
  archiver: top.$archiver,
  version: top.$version,
  rootIsUid: true,
  className: cls.$classname,
  entries,
}));
