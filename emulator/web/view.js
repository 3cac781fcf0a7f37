// The live view of the emulated phone: one event stream brings every change; the controls send
// a value with one request each. Every shown item is the element with data-item="NAME", its
// value in data-value.
'use strict';

const items = {};

const $ = (selector, from = document) => from.querySelector(selector);
const element = (tag, props = {}, ...children) => {
  const e = document.createElement(tag);
  Object.assign(e, props);
  e.append(...children);
  return e;
};
const itemElement = (name) => $(`[data-item="${CSS.escape(name)}"]`);
const level = (name) => Math.max(0, Math.min(255, parseInt(items[name], 10) || 0));

const SHOWN = {
  'backlight.lcd': (v) => `${v} / 255`,
  'backlight.button': (v) => `${v} / 255`,
  'flash.ext': (v) => ({ '0': 'off', '1': 'on', '2': 'on (2)' }[v] ?? v),
};

// --- Items ----------------------------------------------------------------------------------

function showItem(name) {
  const e = itemElement(name);
  if (!e) return;
  const value = items[name] ?? '';
  e.dataset.value = value;
  const control = e.querySelector('input, select');
  if (!control) {
    e.textContent = value === '' ? '–' : (SHOWN[name] ? SHOWN[name](value) : value);
    return;
  }
  if (control.type === 'checkbox') control.checked = value === '1';
  else if (document.activeElement !== control) control.value = value;
}

function lightLed(id, brightness) {
  const led = document.getElementById(id);
  const on = brightness > 0;
  led.style.fill = on ? led.dataset.color : '';
  led.style.opacity = on ? 0.35 + 0.65 * brightness / 255 : '';
  led.setAttribute('filter', on ? 'url(#glow)' : '');
}

function drawPhone() {
  lightLed('pic-led-red', level('led.red'));
  lightLed('pic-led-green', level('led.green'));
  lightLed('pic-led-blue', level('led.blue'));
  lightLed('pic-flash-white', level('flash.white') ? 255 : 0);
  lightLed('pic-flash-warm', level('flash.warm') ? 255 : 0);
  lightLed('pic-flash-ext', level('flash.ext') ? 255 : 0);
  const blanked = items.framebuffer === 'blanked';
  const lcd = blanked ? 0 : level('backlight.lcd');
  $('#pic-dim').style.opacity = lcd ? 0.8 * (1 - lcd / 255) : 1;
  $('#pic-blanked').style.display = blanked ? '' : 'none';
  $('#pic-keys').classList.toggle('lit', level('backlight.button') > 0);
  $('#phone').classList.toggle('vibrating', items.vibrator === 'on');
  $('#headset-plug').style.display = items.headset === '1' ? '' : 'none';
  $('#usb-plug').style.display = items['usb.cable'] === '1' ? '' : 'none';

  const sims = ['sim.1', 'sim.2'].filter((s) => items[s] === '1').map((s) => `SIM${s.at(-1)}`);
  $('#pic-status-left').textContent = [...sims, items.card === '1' ? 'SD' : ''].join(' ') || 'no SIM';
  const charging = ['Charging', 'Full'].includes(items['battery.status']) ? '⚡' : '';
  $('#pic-status-right').textContent = `${charging}${items['battery.capacity'] ?? '?'} %`;
  const screen = items.screen || 'none';
  const [pkg, activity] = screen.includes('/') ? screen.split('/') : ['', screen];
  $('#pic-screen').textContent = activity.replace(/^\./, '') || 'none';
  $('#pic-package').textContent = pkg;
  $('#pic-audio').textContent = `♪ ${items['audio.path'] || 'none'}`;
  $('#pic-streams').textContent = ['battery', 'gsensor', 'gps']
    .filter((s) => items[`stream.${s}`] === 'on').map((s) => `▸ ${s}`).join('  ');
  $('#pic-wakelock').textContent = items.wakelock === 'held' ? 'wake lock held' : '';
  document.body.dataset.power = items.power || '';
}

// --- Dialogue -------------------------------------------------------------------------------

function showEntry(entry) {
  let row = $(`#dialogue tr[data-entry="${entry.id}"]`);
  if (!row) {
    row = element('tr');
    row.dataset.entry = entry.id;
    row.append(element('td', { className: 'mono time' }), element('td', { className: 'mono' }),
      element('td', { className: 'mono answer' }), element('td', { className: 'ms' }));
    $('#dialogue').append(row);
    while ($('#dialogue').rows.length > 200) $('#dialogue').rows[0].remove();
  }
  const answer = entry.answer ?? '…';
  const word = answer.split('\n').at(-1);
  row.className = word === 'OK' ? 'ok' : /ERROR|Not Implement|UNKNOWN/.test(word) ? 'error' : '';
  [entry.time, entry.line, answer, entry.ms ?? ''].forEach((text, i) => {
    row.cells[i].textContent = text;
  });
}

// --- Controls -------------------------------------------------------------------------------

async function send(name, value, box) {
  const error = box.querySelector('.error');
  error.textContent = '';
  try {
    const answer = await fetch('/api/control', {
      method: 'POST', headers: { 'Content-Type': 'application/json' },
      body: JSON.stringify({ name, value }),
    });
    if (!answer.ok) error.textContent = (await answer.json()).error;
  } catch (failure) {
    error.textContent = `not sent: ${failure.message}`;
  }
}

function controlInput(description) {
  if (description.kind === 'choice') {
    const values = description.choices.map(([v]) => v).sort().join();
    if (values === '0,1' && description.choices.every(([, l]) => l === 'yes' || l === 'no')) {
      return element('input', { type: 'checkbox' });
    }
    return element('select', {},
      ...description.choices.map(([value, label]) => element('option', { value }, label)));
  }
  if (description.kind === 'integer') {
    return element('input', { type: 'number', min: description.min, max: description.max,
      step: 1, required: true });
  }
  return element('input', { type: 'text' });
}

function controlBox(name, label, description) {
  const id = `control-${name}`;
  const input = controlInput(description);
  input.id = id;
  const box = element('form', { className: 'control' });
  box.dataset.item = name;
  box.dataset.value = '';
  const unit = description.unit ? element('span', { className: 'unit' }, description.unit) : '';
  box.append(element('label', { htmlFor: id, title: description.help || '' }, label), input, unit);
  const submit = () => send(name, input.type === 'checkbox' ? (input.checked ? '1' : '0') : input.value, box);
  if (input.type === 'checkbox' || input.tagName === 'SELECT') {
    input.addEventListener('change', submit);
  } else {
    box.append(element('button', { type: 'submit' }, 'Set'));
  }
  box.addEventListener('submit', (event) => { event.preventDefault(); submit(); });
  box.append(element('span', { className: 'error', role: 'alert' }));
  return box;
}

const groups = {};
function group(title) {
  if (!groups[title]) {
    groups[title] = element('fieldset', {}, element('legend', {}, title));
    $('#controls').append(groups[title]);
  }
  return groups[title];
}

let families = [];
function buildControls(described) {
  for (const control of described.controls) {
    group(control.group).append(controlBox(control.name, control.label, control));
  }
  families = described.families;
  for (const family of families) {
    const key = element('input', { type: 'text', placeholder: family.key_help, required: true });
    const value = element('input', { type: 'text', placeholder: 'value' });
    const box = element('form', { className: 'control add' },
      element('label', {}, `${family.label}`), key, value, element('button', { type: 'submit' }, 'Set'),
      element('span', { className: 'error', role: 'alert' }));
    box.addEventListener('submit', (event) => {
      event.preventDefault();
      send(family.prefix + key.value, value.value, box);
    });
    group(family.group).append(box);
  }
}

// An item of a family (an NV item, a property) gets its control when it appears.
function familyItem(name) {
  const family = families.find((f) => name.startsWith(f.prefix));
  if (!family) return;
  const box = itemElement(name);
  if (items[name] === undefined) {
    if (box) box.remove();
  } else if (!box) {
    group(family.group).append(controlBox(name, name.slice(family.prefix.length), family));
  }
}

// --- Events ---------------------------------------------------------------------------------

function apply(change) {
  if (change.reset) $('#dialogue').replaceChildren();
  for (const [name, value] of Object.entries(change.items)) {
    if (value === null) delete items[name];
    else items[name] = value;
    familyItem(name);
    showItem(name);
  }
  change.dialogue.forEach(showEntry);
  if (change.dialogue.length) {
    const scroll = $('#dialogue-scroll');
    scroll.scrollTop = scroll.scrollHeight;
  }
  drawPhone();
}

async function start() {
  buildControls(await (await fetch('/api/controls')).json());
  const events = new EventSource('/api/events');
  events.onmessage = (message) => apply(JSON.parse(message.data));
  events.onopen = () => { $('#connection').hidden = true; };
  events.onerror = () => { $('#connection').hidden = false; };
}

start();
