import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import AngleDoubleLeftIcon from '@patternfly/react-icons/dist/esm/icons/angle-double-left-icon';
import AngleDoubleRightIcon from '@patternfly/react-icons/dist/esm/icons/angle-double-right-icon';
import AngleLeftIcon from '@patternfly/react-icons/dist/esm/icons/angle-left-icon';
import AngleRightIcon from '@patternfly/react-icons/dist/esm/icons/angle-right-icon';
import { t } from '../../texts';

export interface PageOf {
  // The first row that is shown, from 0.
  offset: number;
  // Rows of a page.
  size: number;
  total: number;
}

interface PagerProps extends PageOf {
  onOffset: (offset: number) => void;
  // Names the list, for a screen reader.
  label: string;
  // The words, such as "1 to 100 of 5,009 users"; absent in the second pager of a list, which need not be read out.
  words?: string;
}

export function lastOffset({ size, total }: Omit<PageOf, 'offset'>): number {
  return total <= 0 ? 0 : Math.floor((total - 1) / size) * size;
}

// The offset so many pages on, within the list.
export function turned(page: PageOf, pages: number): number {
  return Math.min(Math.max(0, page.offset + pages * page.size), lastOffset(page));
}

// First, previous, next and last page. The buttons can be reached also when they have nothing to do, so that the focus
// does not get lost at the end of a list.
export function Pager({ onOffset, label, words, ...page }: PagerProps) {
  const last = lastOffset(page);
  const atStart = page.offset <= 0;
  const atEnd = page.offset >= last;
  const pages = Math.floor(last / page.size) + 1;
  const button = (name: string, icon: React.ReactNode, offset: number, off: boolean) => (
    <Button
      variant="plain"
      size="sm"
      icon={icon}
      aria-label={name}
      isAriaDisabled={off}
      onClick={() => onOffset(offset)}
    />
  );
  return (
    <div className="vorn-pager">
      {words !== undefined && (
        <p className="vorn-pager__words" role="status">
          {words}
        </p>
      )}
      {pages > 1 && (
        <nav className="vorn-pager__buttons" aria-label={label}>
          {button(t('list.first'), <AngleDoubleLeftIcon />, 0, atStart)}
          {button(t('list.previous'), <AngleLeftIcon />, turned(page, -1), atStart)}
          <span className="vorn-pager__page">
            {t('list.page', { page: Math.floor(page.offset / page.size) + 1, pages })}
          </span>
          {button(t('list.next'), <AngleRightIcon />, turned(page, 1), atEnd)}
          {button(t('list.last'), <AngleDoubleRightIcon />, last, atEnd)}
        </nav>
      )}
    </div>
  );
}
