#!/usr/bin/env node
// Compares the face engine with the face networks' own reference pipeline
// (the npm package's node build on TensorFlow.js, CPU backend) on the same
// decoded photos, face by face: box IoU, landmark error as a fraction of the
// face size, age difference, smile difference and descriptor cosine. Also
// counts what the engine finds as the photo analysis configures it.
//
// Then the identity check: each reference face against itself mirrored,
// rescaled by 0.5 and 2, brightened and recompressed (JPEG, quality 75),
// and against the other people of its photo.
//
//   NODE_PATH=<dir with @tensorflow/*> JPEG_JS=<jpeg-js package dir> \
//     node run_parity.js <face-api package dir> <oriel_dump> <photo.ppm>...
// (tools/parity/run.sh installs the modules into the cache and runs this.)
'use strict';
const fs = require('fs');
const path = require('path');
const { execFileSync } = require('child_process');

const [pkgDir, dumpTool, ...photos] = process.argv.slice(2);
const tf = require('@tensorflow/tfjs');
const faceapi = require(path.join(pkgDir, 'dist/face-api.node-wasm.js'));

function readPpm(file) {
  const buf = fs.readFileSync(file);
  const header = buf.toString('latin1', 0, 64).match(/^P6\s+(\d+)\s+(\d+)\s+255\s/);
  if (!header) throw new Error(`${file}: not a binary PPM`);
  const [, w, h] = header.map(Number);
  return { w, h, data: buf.subarray(header[0].length, header[0].length + w * h * 3) };
}

function loadNet(net, name) {
  const dir = path.join(pkgDir, 'model');
  const manifest = JSON.parse(fs.readFileSync(path.join(dir, `${name}-weights_manifest.json`), 'utf8'));
  const weights = manifest.flatMap((g) => g.weights);
  const bin = Buffer.concat(manifest.flatMap((g) => g.paths).map((p) => fs.readFileSync(path.join(dir, p))));
  const map = tf.io.decodeWeights(bin.buffer.slice(bin.byteOffset, bin.byteOffset + bin.length), weights);
  net.loadFromWeightMap(map);
}

function writePpm(file, img) {
  fs.writeFileSync(file, Buffer.concat([Buffer.from(`P6\n${img.w} ${img.h}\n255\n`, 'latin1'), Buffer.from(img.data)]));
}

function transform(img, kind) {
  const { w, h, data } = img;
  if (kind === 'mirror') {
    const out = Buffer.alloc(data.length);
    for (let y = 0; y < h; y++) for (let x = 0; x < w; x++) data.copy(out, (y * w + x) * 3, (y * w + (w - 1 - x)) * 3, (y * w + (w - 1 - x)) * 3 + 3);
    return { w, h, data: out };
  }
  if (kind === 'bright') return { w, h, data: Buffer.from(data.map((v) => Math.min(255, v + 40))) };
  if (kind === 'jpeg') {
    const jpeg = require(process.env.JPEG_JS);
    const rgba = Buffer.alloc(w * h * 4);
    for (let i = 0; i < w * h; i++) { data.copy(rgba, i * 4, i * 3, i * 3 + 3); rgba[i * 4 + 3] = 255; }
    const dec = jpeg.decode(jpeg.encode({ width: w, height: h, data: rgba }, 75).data, { formatAsRGBA: false, useTArray: true });
    return { w, h, data: Buffer.from(dec.data) };
  }
  const f = kind === 'half' ? 0.5 : 2;  // bilinear resampling
  const W = Math.round(w * f); const H = Math.round(h * f);
  const out = Buffer.alloc(W * H * 3);
  for (let y = 0; y < H; y++) {
    const sy = Math.min(h - 1, Math.max(0, (y + 0.5) / f - 0.5)); const y0 = Math.floor(sy); const y1 = Math.min(h - 1, y0 + 1); const dy = sy - y0;
    for (let x = 0; x < W; x++) {
      const sx = Math.min(w - 1, Math.max(0, (x + 0.5) / f - 0.5)); const x0 = Math.floor(sx); const x1 = Math.min(w - 1, x0 + 1); const dx = sx - x0;
      for (let c = 0; c < 3; c++) {
        const at = (xx, yy) => data[(yy * w + xx) * 3 + c];
        out[(y * W + x) * 3 + c] = Math.round((at(x0, y0) * (1 - dx) + at(x1, y0) * dx) * (1 - dy) + (at(x0, y1) * (1 - dx) + at(x1, y1) * dx) * dy);
      }
    }
  }
  return { w: W, h: H, data: out };
}

function vectors(file, boxes) {
  const args = ['--vectors', file];
  for (const b of boxes) args.push(...b.map((v) => v.toFixed(6)));
  return JSON.parse(execFileSync(dumpTool, args, { maxBuffer: 1 << 26 }).toString());
}

function iou(a, b) {
  const x0 = Math.max(a[0], b[0]);
  const y0 = Math.max(a[1], b[1]);
  const x1 = Math.min(a[0] + a[2], b[0] + b[2]);
  const y1 = Math.min(a[1] + a[3], b[1] + b[3]);
  const inter = Math.max(0, x1 - x0) * Math.max(0, y1 - y0);
  return inter / (a[2] * a[3] + b[2] * b[3] - inter);
}

function cosine(a, b) {
  let d = 0; let na = 0; let nb = 0;
  for (let i = 0; i < a.length; i++) { d += a[i] * b[i]; na += a[i] * a[i]; nb += b[i] * b[i]; }
  return d / Math.sqrt(na * nb);
}

async function main() {
  await tf.setBackend('cpu');
  await tf.ready();
  loadNet(faceapi.nets.ssdMobilenetv1, 'ssd_mobilenetv1_model');
  loadNet(faceapi.nets.faceLandmark68Net, 'face_landmark_68_model');
  loadNet(faceapi.nets.faceExpressionNet, 'face_expression_model');
  loadNet(faceapi.nets.ageGenderNet, 'age_gender_model');
  loadNet(faceapi.nets.faceRecognitionNet, 'face_recognition_model');
  const rows = [];
  let refFaces = 0; let engineFound = 0; let engineFalse = 0;
  for (const photo of photos) {
    const img = readPpm(photo);
    // The reference pipeline is slow on the CPU backend: its results are
    // kept beside the photo (delete the .ref.json files to recompute).
    const refFile = `${photo}.ref.json`;
    let ref;
    if (fs.existsSync(refFile)) {
      ref = JSON.parse(fs.readFileSync(refFile, 'utf8'));
    } else {
      const tensor = tf.tensor3d(Int32Array.from(img.data), [img.h, img.w, 3], 'int32');
      const full = await faceapi.detectAllFaces(tensor, new faceapi.SsdMobilenetv1Options({ minConfidence: 0.5 }))
        .withFaceLandmarks().withFaceExpressions().withFaceDescriptors().withAgeAndGender();
      tensor.dispose();
      ref = full.map((r) => ({
        detection: { box: { x: r.detection.box.x, y: r.detection.box.y, width: r.detection.box.width, height: r.detection.box.height } },
        landmarks: { positions: r.landmarks.positions.map((p) => ({ x: p.x, y: p.y })) },
        expressions: { happy: r.expressions.happy },
        age: r.age,
        descriptor: Array.from(r.descriptor),
      }));
      fs.writeFileSync(refFile, JSON.stringify(ref));
    }
    const ours = JSON.parse(execFileSync(dumpTool, [photo], { maxBuffer: 1 << 26 }).toString());
    const engine = JSON.parse(execFileSync(dumpTool, ['--engine', photo], { maxBuffer: 1 << 26 }).toString());
    refFaces += ref.length;
    const usedEngine = new Set();
    for (const r of ref) {
      const rb = [r.detection.box.x, r.detection.box.y, r.detection.box.width, r.detection.box.height];
      let best = null; let bestIou = 0;
      for (const o of ours.faces) {
        const v = iou(rb, o.box);
        if (v > bestIou) { bestIou = v; best = o; }
      }
      let eBest = -1; let eIou = 0;
      engine.faces.forEach((e, k) => { const v = iou(rb, e.box); if (v > eIou) { eIou = v; eBest = k; } });
      if (eIou >= 0.5) { engineFound++; usedEngine.add(eBest); }
      const row = { photo: path.basename(photo), box: rb.map((v) => Math.round(v)).join(','), iou: bestIou, engineIou: eIou };
      if (best && best.landmarks.length === 68) {
        const size = Math.max(rb[2], rb[3]);
        let err = 0;
        r.landmarks.positions.forEach((p, k) => { err += Math.hypot(p.x - best.landmarks[k][0], p.y - best.landmarks[k][1]); });
        row.landmarkError = err / 68 / size;
        row.ageDiff = Math.abs(r.age - best.age);
        row.smileDiff = Math.abs(r.expressions.happy - best.expressions[1]) * 100;
        row.cosine = cosine(Array.from(r.descriptor), best.descriptor);
        row.refAge = r.age;
      }
      rows.push(row);
    }
    engineFalse += engine.faces.length - usedEngine.size;
  }
  const f = (v, d) => (v === undefined ? '-' : v.toFixed(d));
  console.log('photo        box (ref, px)            IoU    lm err  age(ref) |dAge| |dSmile| cosine  engineIoU');
  for (const r of rows) {
    console.log(`${r.photo.padEnd(12)} ${r.box.padEnd(24)} ${f(r.iou, 3)}  ${f(r.landmarkError * 100, 2)}%  ${f(r.refAge, 1).padStart(6)}  ${f(r.ageDiff, 2).padStart(5)}  ${f(r.smileDiff, 2).padStart(6)}  ${f(r.cosine, 4)}  ${f(r.engineIou, 2)}`);
  }
  const worst = (k, lo) => rows.reduce((m, r) => (r[k] === undefined ? m : (lo ? Math.min(m, r[k]) : Math.max(m, r[k]))), lo ? Infinity : -Infinity);
  console.log(`faces: reference ${refFaces}; worst IoU ${f(worst('iou', true), 6)}, landmark error ${f(worst('landmarkError', false) * 100, 5)}%, `
    + `age diff ${f(worst('ageDiff', false), 5)}, smile diff ${f(worst('smileDiff', false), 5)}, cosine ${f(worst('cosine', true), 7)}`);
  console.log(`engine as configured by the analysis: ${engineFound} of ${refFaces} reference faces found, ${engineFalse} other detections`);

  // Identity: same face under transformations versus different people.
  const tmp = fs.mkdtempSync(path.join(require('os').tmpdir(), 'parity-'));
  let worstSame = 1; let worstSameWhat = ''; let bestWithin = 0; let bestAcross = 0;
  const all = [];
  for (const photo of photos) {
    const img = readPpm(photo);
    const boxes = rows.filter((r) => r.photo === path.basename(photo)).map((r) => {
      const [x, y, w, h] = r.box.split(',').map(Number);
      return [x / img.w, y / img.h, w / img.w, h / img.h];
    });
    const base = vectors(photo, boxes);
    base.forEach((v, i) => all.push({ photo, i, v }));
    for (let a = 0; a < base.length; a++) for (let b = a + 1; b < base.length; b++) bestWithin = Math.max(bestWithin, cosine(base[a], base[b]));
    for (const kind of ['mirror', 'half', 'double', 'bright', 'jpeg']) {
      const t = transform(img, kind);
      const file = path.join(tmp, `${kind}.ppm`);
      writePpm(file, t);
      const tb = kind === 'mirror' ? boxes.map(([x, y, w, h]) => [1 - x - w, y, w, h]) : boxes;
      vectors(file, tb).forEach((v, i) => {
        const c = cosine(base[i], v);
        if (c < worstSame) { worstSame = c; worstSameWhat = `${path.basename(photo)} face ${i} ${kind}`; }
      });
    }
  }
  for (let a = 0; a < all.length; a++) for (let b = a + 1; b < all.length; b++) if (all[a].photo !== all[b].photo) bestAcross = Math.max(bestAcross, cosine(all[a].v, all[b].v));
  fs.rmSync(tmp, { recursive: true, force: true });
  console.log(`identity: worst same-face similarity ${worstSame.toFixed(4)} (${worstSameWhat}); best different-person similarity `
    + `within one photo ${bestWithin.toFixed(4)}; best across photos (people not checked) ${bestAcross.toFixed(4)}`);
}

main().catch((e) => { console.error(e); process.exit(1); });
