import './list.css';

export { Age } from './Age';
export { lastOffset, Pager, turned, type PageOf } from './Pager';
export { SearchField } from './SearchField';
export { useDebounced } from './useDebounced';
