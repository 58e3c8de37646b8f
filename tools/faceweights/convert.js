#!/usr/bin/env node
// Converts the face networks shipped by the npm package @vladmandic/face-api
// (8-bit quantised tensors, value = q * scale + min) into the face engine's
// own weight blob: float32 tensors already folded (batch norms, scale layers)
// and laid out for the engine's kernels, so that the library can use them in
// place without any conversion at run time.
//
//   node convert.js <package model dir> <output blob>
//
// Blob layout (all little-endian):
//   "LMKFACEW" | u32 version | u32 record count | records... | float data
//   record: u16 name length, name bytes, u8 kind, u8 pad, u32 dims[4],
//           u32 data offset (from blob start, 16-byte aligned), u32 float count
// Kinds: 0 raw tensor, 1 full convolution, 2 depthwise convolution, 3 dense.
//   conv:      dims = kh, kw, cin, cout; weights [ceil(cout/8)][kh][kw][cin][8]
//              (zero padded) then bias [ceil(cout/8) * 8]
//   depthwise: dims = kh, kw, c, 0;     weights [kh][kw][c] then bias [c]
//   dense:     dims = in, out, 0, 0;    weights [in][out] then bias [out]
'use strict';
const fs = require('fs');
const path = require('path');

const VERSION = 1;
const BLOCK = 8;
const [modelDir, outFile] = process.argv.slice(2);
if (!modelDir || !outFile) {
  console.error('usage: convert.js <model dir> <output blob>');
  process.exit(2);
}

// Decodes one model exactly as the package's loader does: the product is
// computed in double precision and rounded once to float32.
function loadModel(name) {
  const manifest = JSON.parse(fs.readFileSync(path.join(modelDir, `${name}-weights_manifest.json`), 'utf8'));
  const tensors = {};
  for (const group of manifest) {
    const buf = Buffer.concat(group.paths.map((p) => fs.readFileSync(path.join(modelDir, p))));
    let off = 0;
    for (const w of group.weights) {
      const n = w.shape.reduce((a, b) => a * b, 1);
      let values;
      if (w.quantization) {
        const q = w.quantization;
        if (q.dtype !== 'uint8') throw new Error(`${w.name}: unsupported quantisation ${q.dtype}`);
        values = new Float64Array(n);
        for (let i = 0; i < n; i++) {
          const v = buf[off + i] * q.scale + q.min;
          values[i] = w.dtype === 'int32' ? Math.round(v) : Math.fround(v);
        }
        off += n;
      } else {
        if (w.dtype !== 'float32') throw new Error(`${w.name}: unsupported dtype ${w.dtype}`);
        values = new Float64Array(n);
        for (let i = 0; i < n; i++) values[i] = buf.readFloatLE(off + 4 * i);
        off += 4 * n;
      }
      tensors[w.name] = { shape: w.shape, values };
    }
    if (off !== buf.length) throw new Error(`${name}: ${buf.length - off} bytes left over`);
  }
  return {
    get(key) {
      const t = tensors[key];
      if (!t) throw new Error(`${name}: missing tensor ${key}`);
      return t;
    },
  };
}

const records = [];

function addRecord(name, kind, dims, data) {
  records.push({ name, kind, dims: dims.concat([0, 0, 0, 0]).slice(0, 4), data });
}

// Full convolution from HWIO filters; scale (per output channel, optional)
// multiplies filters and bias: out = conv(x, f * s) + b * s + shift.
function addConv(name, filters, bias, scale, shift) {
  const [kh, kw, cin, cout] = filters.shape;
  const blocks = Math.ceil(cout / BLOCK);
  const data = new Float64Array(blocks * kh * kw * cin * BLOCK + blocks * BLOCK);
  const f = filters.values;
  for (let cb = 0; cb < blocks; cb++) {
    for (let y = 0; y < kh; y++) {
      for (let x = 0; x < kw; x++) {
        for (let ci = 0; ci < cin; ci++) {
          for (let j = 0; j < BLOCK; j++) {
            const co = cb * BLOCK + j;
            if (co >= cout) continue;
            const s = scale ? scale[co] : 1;
            data[((((cb * kh + y) * kw + x) * cin) + ci) * BLOCK + j] = Math.fround(f[((y * kw + x) * cin + ci) * cout + co] * s);
          }
        }
      }
    }
  }
  const bOff = blocks * kh * kw * cin * BLOCK;
  for (let co = 0; co < cout; co++) {
    const s = scale ? scale[co] : 1;
    const b = bias ? bias.values[co] : 0;
    data[bOff + co] = Math.fround(b * s + (shift ? shift[co] : 0));
  }
  addRecord(name, 1, [kh, kw, cin, cout], data);
}

function addDepthwise(name, filters, scale, shift) {
  const [kh, kw, c] = filters.shape;
  const data = new Float64Array(kh * kw * c + c);
  for (let i = 0; i < kh * kw; i++) {
    for (let ch = 0; ch < c; ch++) {
      data[i * c + ch] = Math.fround(filters.values[i * c + ch] * (scale ? scale[ch] : 1));
    }
  }
  for (let ch = 0; ch < c; ch++) data[kh * kw * c + ch] = shift ? Math.fround(shift[ch]) : 0;
  addRecord(name, 2, [kh, kw, c], data);
}

function addDense(name, weights, bias) {
  const [nin, nout] = weights.shape;
  const data = new Float64Array(nin * nout + nout);
  data.set(weights.values, 0);
  if (bias) data.set(bias.values, nin * nout);
  addRecord(name, 3, [nin, nout], data);
}

function addRaw(name, t) {
  addRecord(name, 0, t.shape.slice(-4), t.values);
}

// Separable convolution: depthwise without bias, then pointwise with bias.
function addSeparable(name, m, prefix) {
  addDepthwise(`${name}/dw`, m.get(`${prefix}/depthwise_filter`));
  addConv(`${name}/pw`, m.get(`${prefix}/pointwise_filter`), m.get(`${prefix}/bias`));
}

// ------------------------------------------------------------ SSD MobileNet v1
{
  const m = loadModel('ssd_mobilenetv1_model');
  addConv('ssd/mb0', m.get('MobilenetV1/Conv2d_0_pointwise/weights'), m.get('MobilenetV1/Conv2d_0_pointwise/convolution_bn_offset'));
  const eps = 0.0010000000474974513;
  for (let i = 1; i <= 13; i++) {
    const p = `MobilenetV1/Conv2d_${i}_depthwise`;
    const gamma = m.get(`${p}/BatchNorm/gamma`).values;
    const beta = m.get(`${p}/BatchNorm/beta`).values;
    const mean = m.get(`${p}/BatchNorm/moving_mean`).values;
    const variance = m.get(`${p}/BatchNorm/moving_variance`).values;
    const c = gamma.length;
    const scale = new Float64Array(c);
    const shift = new Float64Array(c);
    for (let ch = 0; ch < c; ch++) {
      scale[ch] = gamma[ch] / Math.sqrt(variance[ch] + eps);
      shift[ch] = beta[ch] - mean[ch] * scale[ch];
    }
    addDepthwise(`ssd/mb${i}/dw`, m.get(`${p}/depthwise_weights`), scale, shift);
    addConv(`ssd/mb${i}/pw`, m.get(`MobilenetV1/Conv2d_${i}_pointwise/weights`), m.get(`MobilenetV1/Conv2d_${i}_pointwise/convolution_bn_offset`));
  }
  for (let i = 0; i <= 7; i++) {
    addConv(`ssd/pred${i}`, m.get(`Prediction/Conv2d_${i}_pointwise/weights`), m.get(`Prediction/Conv2d_${i}_pointwise/convolution_bn_offset`));
  }
  // Box encodings and class logits of one feature map in one 1x1 convolution:
  // channels [0, 4A) are the encodings, [4A, 7A) the logits (A anchors).
  for (let i = 0; i <= 5; i++) {
    const p = `Prediction/BoxPredictor_${i}`;
    const lw = m.get(`${p}/BoxEncodingPredictor/weights`);
    const lb = m.get(`${p}/BoxEncodingPredictor/biases`);
    const cw = m.get(`${p}/ClassPredictor/weights`);
    const cb = m.get(`${p}/ClassPredictor/biases`);
    const cin = lw.shape[2];
    const nl = lw.shape[3];
    const nc = cw.shape[3];
    const w = new Float64Array(cin * (nl + nc));
    for (let ci = 0; ci < cin; ci++) {
      for (let j = 0; j < nl; j++) w[ci * (nl + nc) + j] = lw.values[ci * nl + j];
      for (let j = 0; j < nc; j++) w[ci * (nl + nc) + nl + j] = cw.values[ci * nc + j];
    }
    const b = new Float64Array(nl + nc);
    b.set(lb.values, 0);
    b.set(cb.values, nl);
    addConv(`ssd/box${i}`, { shape: [1, 1, cin, nl + nc], values: w }, { values: b });
  }
  addRaw('ssd/anchors', m.get('Output/extra_dim'));
}

// ------------------------------------------------------------ tiny face detector
{
  const m = loadModel('tiny_face_detector_model');
  addConv('tfd/conv0', m.get('conv0/filters'), m.get('conv0/bias'));
  for (let i = 1; i <= 5; i++) addSeparable(`tfd/conv${i}`, m, `conv${i}`);
  addConv('tfd/conv8', m.get('conv8/filters'), m.get('conv8/bias'));
}

// ------------------------------------------------------------ 68-point landmarks and expressions
for (const [prefix, model] of [['lm68', 'face_landmark_68_model'], ['expr', 'face_expression_model']]) {
  const m = loadModel(model);
  for (let d = 0; d < 4; d++) {
    if (d === 0) addConv(`${prefix}/dense0/conv0`, m.get('dense0/conv0/filters'), m.get('dense0/conv0/bias'));
    else addSeparable(`${prefix}/dense${d}/conv0`, m, `dense${d}/conv0`);
    for (let c = 1; c <= 3; c++) addSeparable(`${prefix}/dense${d}/conv${c}`, m, `dense${d}/conv${c}`);
  }
  addDense(`${prefix}/fc`, m.get('fc/weights'), m.get('fc/bias'));
}

// ------------------------------------------------------------ age (and gender)
{
  const m = loadModel('age_gender_model');
  addConv('age/conv_in', m.get('entry_flow/conv_in/filters'), m.get('entry_flow/conv_in/bias'));
  const reduction = (name, p) => {
    addSeparable(`${name}/sep0`, m, `${p}/separable_conv0`);
    addSeparable(`${name}/sep1`, m, `${p}/separable_conv1`);
    addConv(`${name}/expand`, m.get(`${p}/expansion_conv/filters`), m.get(`${p}/expansion_conv/bias`));
  };
  reduction('age/red0', 'entry_flow/reduction_block_0');
  reduction('age/red1', 'entry_flow/reduction_block_1');
  for (let b = 0; b < 2; b++) {
    for (let s = 0; s < 3; s++) addSeparable(`age/main${b}/sep${s}`, m, `middle_flow/main_block_${b}/separable_conv${s}`);
  }
  reduction('age/red2', 'exit_flow/reduction_block');
  addSeparable('age/exit', m, 'exit_flow/separable_conv');
  addDense('age/fc_age', m.get('fc/age/weights'), m.get('fc/age/bias'));
  addDense('age/fc_gender', m.get('fc/gender/weights'), m.get('fc/gender/bias'));
}

// ------------------------------------------------------------ recognition (ResNet-34 style, 128-d)
{
  const m = loadModel('face_recognition_model');
  const convScale = (name, p) => {
    addConv(name, m.get(`${p}/conv/filters`), m.get(`${p}/conv/bias`), m.get(`${p}/scale/weights`).values,
      m.get(`${p}/scale/biases`).values);
  };
  convScale('rec/conv32_down', 'conv32_down');
  const blocks = ['conv32_1', 'conv32_2', 'conv32_3', 'conv64_down', 'conv64_1', 'conv64_2', 'conv64_3',
    'conv128_down', 'conv128_1', 'conv128_2', 'conv256_down', 'conv256_1', 'conv256_2', 'conv256_down_out'];
  for (const b of blocks) {
    convScale(`rec/${b}/conv1`, `${b}/conv1`);
    convScale(`rec/${b}/conv2`, `${b}/conv2`);
  }
  addDense('rec/fc', m.get('fc'), null);
}

// ------------------------------------------------------------ write
function align16(n) { return (n + 15) & ~15; }
let headerSize = 8 + 4 + 4;
for (const r of records) headerSize += 2 + Buffer.byteLength(r.name) + 2 + 16 + 8;
let offset = align16(headerSize);
for (const r of records) {
  r.offset = offset;
  offset = align16(offset + 4 * r.data.length);
}
const out = Buffer.alloc(offset);
let p = 0;
out.write('LMKFACEW', 0, 'latin1');
p = 8;
p = out.writeUInt32LE(VERSION, p);
p = out.writeUInt32LE(records.length, p);
for (const r of records) {
  const nb = Buffer.from(r.name);
  p = out.writeUInt16LE(nb.length, p);
  nb.copy(out, p);
  p += nb.length;
  p = out.writeUInt8(r.kind, p);
  p = out.writeUInt8(0, p);
  for (const d of r.dims) p = out.writeUInt32LE(d, p);
  p = out.writeUInt32LE(r.offset, p);
  p = out.writeUInt32LE(r.data.length, p);
}
for (const r of records) {
  for (let i = 0; i < r.data.length; i++) out.writeFloatLE(r.data[i], r.offset + 4 * i);
}
const tmp = `${outFile}.tmp${process.pid}`;
fs.mkdirSync(path.dirname(outFile), { recursive: true });
fs.writeFileSync(tmp, out);
fs.renameSync(tmp, outFile);
console.log(`face weights: ${records.length} tensors, ${out.length} bytes -> ${outFile}`);
