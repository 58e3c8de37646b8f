#!/usr/bin/env node
// Decodes the sample photos shipped with the face network package into
// binary PPM files that the engine's tests, benchmarks and the parity tool
// read (the library itself has no JPEG decoder).
//
//   node samples.js <jpeg-js package dir> <output dir> <photo.jpg>...
'use strict';
const fs = require('fs');
const path = require('path');

const [jpegDir, outDir, ...photos] = process.argv.slice(2);
const jpeg = require(path.resolve(jpegDir));
fs.mkdirSync(outDir, { recursive: true });
for (const photo of photos) {
  const img = jpeg.decode(fs.readFileSync(photo), { useTArray: true, formatAsRGBA: false, maxMemoryUsageInMB: 1024 });
  const header = Buffer.from(`P6\n${img.width} ${img.height}\n255\n`, 'latin1');
  const name = path.basename(photo).replace(/\.[^.]*$/, '.ppm');
  const tmp = path.join(outDir, `${name}.tmp${process.pid}`);
  fs.writeFileSync(tmp, Buffer.concat([header, Buffer.from(img.data.buffer, img.data.byteOffset, img.width * img.height * 3)]));
  fs.renameSync(tmp, path.join(outDir, name));
  console.log(`${name}: ${img.width} x ${img.height}`);
}
