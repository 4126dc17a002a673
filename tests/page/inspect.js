// Returns the faults of the open page as a list of texts.
(() => {
  const faults = [];
  const near = 2;
  const root = document.documentElement;
  if (root.scrollWidth > root.clientWidth) faults.push(`the page is ${root.scrollWidth} wide`);

  for (const element of document.querySelectorAll('body *')) {
    const style = getComputedStyle(element);
    if (style.overflowX !== 'visible' && element.scrollWidth > element.clientWidth ||
        style.overflowY !== 'visible' && element.scrollHeight > element.clientHeight)
      faults.push(`cut: ${element.textContent.slice(0, 60)}`);
    for (const attribute of element.attributes)
      if (attribute.name.startsWith('on')) faults.push(`handler ${attribute.name}`);
  }
  for (const element of document.querySelectorAll('script, link, img, iframe, object'))
    faults.push(`element ${element.tagName}`);

  // Drawings stay within their charts.
  for (const svg of document.querySelectorAll('svg')) {
    const outer = svg.getBoundingClientRect();
    if (outer.width < 40 || outer.height < 5) faults.push(`a chart of ${outer.width} x ${outer.height}`);
    for (const part of svg.querySelectorAll('*')) {
      const box = part.getBoundingClientRect();
      if (box.left < outer.left - near || box.right > outer.right + near ||
          box.top < outer.top - near || box.bottom > outer.bottom + near)
        faults.push(`outside of its chart: ${svg.getAttribute('aria-label')}`);
    }
  }

  // Texts without a title begin at the left.
  for (const cell of document.querySelectorAll('td:not([data-title])')) {
    const range = document.createRange();
    range.selectNodeContents(cell);
    if (range.getBoundingClientRect().left > cell.getBoundingClientRect().left + near)
      faults.push(`at the right: ${cell.textContent.slice(0, 60)}`);
  }

  const luminance = color => {
    const [red, green, blue] = color.match(/[\d.]+/g).map(part => {
      const share = part / 255;
      return share <= 0.04045 ? share / 12.92 : ((share + 0.055) / 1.055) ** 2.4;
    });
    return 0.2126 * red + 0.7152 * green + 0.0722 * blue;
  };
  const backgroundOf = element => {
    for (; element; element = element.parentElement) {
      const color = getComputedStyle(element).backgroundColor;
      if (!/^rgba\(.*, 0\)$/.test(color)) return color;
    }
    return 'rgb(255, 255, 255)';
  };

  const boxes = [];
  const texts = document.createTreeWalker(document.body, NodeFilter.SHOW_TEXT);
  for (let node = texts.nextNode(); node; node = texts.nextNode()) {
    const text = node.data.trim();
    const range = document.createRange();
    range.selectNodeContents(node);
    const rects = text ? [...range.getClientRects()] : [];
    const shown = rects.filter(rect => rect.width > 0);
    if (text && !shown.length && node.parentElement.closest('thead, nav') === null)
      faults.push(`hidden: ${text.slice(0, 60)}`);
    for (const rect of shown) {
      if (rect.left < 0 || rect.right > root.clientWidth + 1) faults.push(`off the page: ${text.slice(0, 60)}`);
      boxes.push({node, text, rect});
    }
    if (!shown.length) continue;
    const [light, dark] = [getComputedStyle(node.parentElement).color, backgroundOf(node.parentElement)]
        .map(luminance).sort((a, b) => b - a);
    const contrast = (light + 0.05) / (dark + 0.05);
    if (contrast < 4.5) faults.push(`contrast ${contrast.toFixed(2)}: ${text.slice(0, 60)}`);
  }

  boxes.sort((a, b) => a.rect.top - b.rect.top);
  boxes.forEach((box, index) => {
    for (let i = index + 1; i < boxes.length && boxes[i].rect.top < box.rect.bottom - near; ++i) {
      const other = boxes[i];
      if (other.node !== box.node && other.rect.left < box.rect.right - near &&
          box.rect.left < other.rect.right - near)
        faults.push(`overlap: ${box.text.slice(0, 40)} / ${other.text.slice(0, 40)}`);
    }
  });
  return [...new Set(faults)];
})()
