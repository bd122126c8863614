// The one box that tells what is under the pointer.
const box = document.getElementById("tooltip");
const distance = 14; // from the pointer

export function showTooltip(event, content) {
  box.replaceChildren(...content);
  box.hidden = false;
  const right = event.clientX + distance;
  const below = event.clientY + distance;
  const left = right + box.offsetWidth > innerWidth ? event.clientX - distance - box.offsetWidth : right;
  const top = below + box.offsetHeight > innerHeight ? event.clientY - distance - box.offsetHeight : below;
  box.style.left = `${Math.max(left, 4)}px`;
  box.style.top = `${Math.max(top, 4)}px`;
}

export function hideTooltip() {
  box.hidden = true;
}
